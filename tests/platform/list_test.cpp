// Linked lists of the caller's data.
#include "vorn/list.h"

#include <gtest/gtest.h>

#include <vector>

namespace {

std::vector<int*> released;

void release(void* data) {
  released.push_back(static_cast<int*>(data));
}

// A million, so that an append that walks the list doesn't come to an end.
TEST(LinkedList, KeepsAMillionInOrder) {
  std::vector<int> data(1'000'000);
  QAZLLNode* head = nullptr;
  for (int& item : data) {
    ASSERT_EQ(0, QAZLLadd(&head, &item, nullptr));
  }
  const QAZLLNode* node = head;
  for (int& item : data) {
    ASSERT_NE(nullptr, node);
    ASSERT_EQ(&item, node->data);
    node = node->next;
  }
  EXPECT_EQ(nullptr, node);

  QAZLLfree(&head, release);
  EXPECT_EQ(nullptr, head);
  ASSERT_EQ(data.size(), released.size());
  EXPECT_EQ(&data.front(), released.front());
  EXPECT_EQ(&data.back(), released.back());
  released.clear();

  EXPECT_EQ(0, QAZLLadd(&head, data.data(), nullptr)) << "an emptied list can be filled again";
  EXPECT_EQ(-1, QAZLLadd(&head, nullptr, nullptr));
  EXPECT_EQ(-1, QAZLLadd(nullptr, data.data(), nullptr));
  QAZLLfree(&head, nullptr);
  QAZLLfree(&head, release);
  QAZLLfree(nullptr, release);
  EXPECT_TRUE(released.empty());
}

}  // namespace
