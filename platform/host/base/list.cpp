// Singly linked lists.
#include "vorn/list.h"

#include <cerrno>
#include <new>

int QAZLLadd(QAZLLNode** head, void* data, QAZLLCompare /*compare*/) {
  if (head == nullptr || data == nullptr) {
    errno = EINVAL;
    return -1;
  }
  auto* node = new (std::nothrow) QAZLLNode{data, nullptr, nullptr};
  if (node == nullptr) {
    errno = ENOMEM;
    return -1;
  }
  if (*head == nullptr) {
    *head = node;
  } else {
    (*head)->last->next = node;
  }
  (*head)->last = node;
  return 0;
}

void QAZLLfree(QAZLLNode** head, void (*release)(void* data)) {
  if (head == nullptr) {
    return;
  }
  // Emptied first, so that a release function that looks at the list finds no freed node.
  QAZLLNode* node = *head;
  *head = nullptr;
  while (node != nullptr) {
    QAZLLNode* next = node->next;
    if (release != nullptr) {
      release(node->data);
    }
    delete node;
    node = next;
  }
}
