// Accounts, as the name service knows them (the sandbox has a password file of the tests' own).
#include "machine/users.hpp"

#include <gtest/gtest.h>
#include <sys/resource.h>

#include "support.hpp"
#include "vorn/report.h"
#include "vorn/user.h"

TEST(Users, HandOutHarmlessNamesOnly) {
  VLIBCSzHash* made = nullptr;
  ASSERT_EQ(0, VornQazInitFilterUser(&made));
  const support::Hash filter(made);
  const std::tuple<uid_t, const char*, bool> cases[] = {
      {0, "root", true},        {5001, "CORP/anna", true},
      {5002, "john-doe", true}, {5003, "müller (it)", true},
      {5004, "o'brien", false}, {5005, "a<b", false},
      {5006, "@sum", false},    {5007, "latin\xfc", false},
      {5008, "[x]", false},     {4'000'000'000, "no-such-account", false}};
  for (const auto& [uid, name, known] : cases) {
    EXPECT_EQ(known, VLIBCSzHashGetValue(made, name) != nullptr) << name;
    VORNUser* user = nullptr;
    ASSERT_EQ(known ? 0 : -1, VORNUserGetByUID(uid, &user)) << name;
    if (known) {
      EXPECT_STREQ(name, user->name);
      EXPECT_EQ(uid, user->uid);
      EXPECT_EQ(uid == 0 ? 0U : 600U, user->gid);
    }
    VORNUserFree(user);
  }
  EXPECT_EQ(5U, support::syslog_lines().size()) << "one for each that was refused";
}

// The sandbox's name service reads files, which nobody can who may open none.
TEST(Users, AreMissedOnceWhenTheNameServiceFails) {
  EXPECT_TRUE(support::passes_in_child([] {
    static std::string told;
    VornQazSetIncidentSink([](const char* kind, const char* what, const char* text) {
      told += std::string(kind) + "|" + what + "|" + text + "\n";
    });
    VORNUser* user = nullptr;
    EXPECT_EQ(-1, VORNUserGet("no-such-account", &user));
    EXPECT_EQ("", told) << "an account that doesn't exist is nothing to tell";
    const rlimit none{0, 0};
    setrlimit(RLIMIT_NOFILE, &none);
    EXPECT_EQ(-1, VORNUserGetByUID(5999, &user));
    EXPECT_EQ(-1, VORNUserGet("nobody-asked-for-yet", &user));
    EXPECT_EQ(
        "users_unknown|Too many open files|the name service fails (Too many open files), so "
        "accounts are missing from the reports; see to the services that the passwd line of "
        "/etc/nsswitch.conf names\n",
        told);
  }));
}

TEST(AccountNames, AreSafeWhereverReportsWriteThem) {
  for (const std::string name :
       {"x.y_z-1", "2012345", "anna@corp.example", "CORP+anna", "$MACHINE"}) {
    EXPECT_EQ(nullptr, host::account_name_error(name)) << name;
  }
  for (const std::string& name :
       {std::string(""), std::string(256, 'n'), std::string("a\"b"), std::string("a\\b"),
        std::string("a`b"), std::string("a\nb"), std::string("=x"), std::string("＝x"),
        std::string("a:b"), std::string("a\u202eb"), std::string("a\0b", 3)}) {
    EXPECT_NE(nullptr, host::account_name_error(name)) << name;
  }
}
