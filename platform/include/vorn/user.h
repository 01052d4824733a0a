// User accounts, through the system's name service.
//
// Reports write names as they are into quoted JavaScript strings and CSV fields and, without
// quotes, as keys of JavaScript objects. So a name that is handed out is valid UTF-8 of at most 255
// bytes, holds no control character, quote, back quote, backslash or '<' and nothing that neither
// Unix nor Active Directory allows ( [ ] : ; | = * ? ), and doesn't begin as a formula does (= + -
// @). An account with any other name counts as unknown, with one syslog line in the life of the
// process.
//
// The exception is a domain's account as winbind names it by default, "DOM\name": it is handed out,
// and is to be asked for, as "DOM/name". Asked for with the backslash it counts as unknown.
#ifndef VORN_USER_H
#define VORN_USER_H

#include <sys/types.h>

#ifdef __cplusplus
extern "C" {
#endif

typedef struct VORNUser {
  char* name;
  uid_t uid;
  gid_t gid;
} VORNUser;

// The account `name` or of id `uid`, into a new record that the caller frees with VORNUserFree. 0;
// -1 when there is no such account, with `*user` null and errno set.
int VORNUserGet(const char* name, VORNUser** user);
int VORNUserGetByUID(uid_t uid, VORNUser** user);
// Accepts null.
void VORNUserFree(VORNUser* user);

// The ids of the account `name` as the name service knows it (no name is handed out, so any will
// do); `gid` may be null. 0, or -1 when there is no such account.
// Look-ups, failed ones too, are cached for the process.
int VORNUserGetUGID(const char* name, uid_t* uid, gid_t* gid);

#ifdef __cplusplus
}
#endif

#endif
