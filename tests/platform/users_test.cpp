// Accounts, as the name service knows them (the sandbox has a password file of the tests' own).
#include "users.hpp"

#include <gtest/gtest.h>

#include <cerrno>

#include "support.hpp"
#include "vorn/report.h"
#include "vorn/user.h"

namespace {

struct FreeUser {
  void operator()(VORNUser* user) const { VORNUserFree(user); }
};

// "name uid gid" of an account, or "none" when the look-up failed as it should.
std::string described(int result, VORNUser* user) {
  const std::unique_ptr<VORNUser, FreeUser> owner(user);
  if (result != 0) {
    return user == nullptr && errno == ENOENT ? "none" : "failed badly";
  }
  return std::string(user->name) + " " + std::to_string(user->uid) + " " +
         std::to_string(user->gid);
}

std::string by_uid(uid_t uid) {
  VORNUser* user = nullptr;
  const int result = VORNUserGetByUID(uid, &user);
  return described(result, user);
}

std::string by_name(const char* name) {
  VORNUser* user = nullptr;
  const int result = VORNUserGet(name, &user);
  return described(result, user);
}

TEST(Users, HandOutHarmlessNamesOnly) {
  VLIBCSzHash* made = nullptr;
  ASSERT_EQ(0, VornQazInitFilterUser(&made));
  const support::Hash filter(made);
  struct Case {
    uid_t uid;
    const char* name;  // as it is asked for
    bool harmless;
  };
  const Case cases[] = {
      {0, "root", true},           {5001, "CORP/anna", true},  {5002, "john-doe", true},
      {5003, "müller (it)", true}, {5004, "o'brien", false},   {5005, "a<b", false},
      {5006, "@sum", false},       {5007, "latin\xfc", false}, {5008, "[x]", false},
  };
  for (int round = 0; round < 2; ++round) {  // the second answers come from the cache
    for (const auto& [uid, name, harmless] : cases) {
      const char* gid = uid == 0 ? " 0" : " 600";
      const std::string expected =
          harmless ? name + (" " + std::to_string(uid)) + gid : std::string("none");
      EXPECT_EQ(expected, by_uid(uid));
      EXPECT_EQ(expected, by_name(name));
      EXPECT_EQ(harmless, VLIBCSzHashGetValue(made, name) != nullptr) << name;
      uid_t found = 0;
      gid_t group = 0;
      EXPECT_EQ(0, VORNUserGetUGID(name, &found, &group)) << name;
      EXPECT_EQ(uid, found) << name;
      EXPECT_EQ(uid == 0 ? 0U : 600U, group) << name;
    }
  }
  EXPECT_EQ(5U, support::syslog_lines().size()) << "one for each that was refused";
}

TEST(Users, OfADomainAreAskedForWithASlash) {
  VLIBCSzHash* made = nullptr;
  ASSERT_EQ(0, VornQazInitFilterUser(&made));
  const support::Hash filter(made);
  EXPECT_EQ(nullptr, VLIBCSzHashGetValue(made, "CORP\\anna"));
  EXPECT_EQ("none", by_name("CORP\\anna"));
  EXPECT_EQ(
      "account \"CORP\\anna\" is left out: write it with '/' in vornreport.conf; the quota report "
      "shows it when smb.conf has another \"winbind separator\" than the backslash",
      support::syslog_text());
  uid_t uid = 0;
  EXPECT_EQ(0, VORNUserGetUGID("CORP\\anna", &uid, nullptr));
  EXPECT_EQ(5001U, uid);
}

TEST(Users, UnknownOnesAreNone) {
  VLIBCSzHash* made = nullptr;
  ASSERT_EQ(0, VornQazInitFilterUser(&made));
  const support::Hash filter(made);
  errno = 0;
  EXPECT_EQ("none", by_uid(4'000'000'000));
  for (const char* name : {"no-such-account", "CORP/nobody", "#1001", "it's"}) {
    EXPECT_EQ("none", by_name(name));
    EXPECT_EQ(nullptr, VLIBCSzHashGetValue(made, name));
  }
  uid_t uid = 7;
  VORNUser* user = nullptr;
  for (const char* name : {"", static_cast<const char*>(nullptr)}) {
    EXPECT_EQ(-1, VORNUserGet(name, &user));
    EXPECT_EQ(-1, VORNUserGetUGID(name, &uid, nullptr));
  }
  EXPECT_EQ(-1, VORNUserGetByUID(0, nullptr));
  EXPECT_EQ(7U, uid);
  EXPECT_EQ("", support::syslog_text());
}

TEST(AccountNames, AreSafeWhereverReportsWriteThem) {
  for (const std::string name :
       {"a", "x.y_z-1", "2012345", "anna@corp.example", "CORP+anna", "domain users", "$MACHINE"}) {
    EXPECT_EQ(nullptr, host::account_name_error(name)) << name;
  }
  for (const std::string& name :
       {std::string(""), std::string(256, 'n'), std::string("a\"b"), std::string("a\\b"),
        std::string("a`b"), std::string("a\nb"), std::string("a\tb"), std::string("=x"),
        std::string("+x"), std::string("-x"), std::string("＝x"), std::string(" =x"),
        std::string("a:b"), std::string("a?b"), std::string("a\u2028b"), std::string("a\u202eb"),
        std::string("a\0b", 3)}) {
    EXPECT_NE(nullptr, host::account_name_error(name)) << name;
  }
  EXPECT_EQ("CORP/anna", host::shown_account_name("CORP\\anna"));
}

}  // namespace
