// User accounts, through the system's name service.
//
// A name that is handed out stands for itself in a quoted JavaScript string, in a quoted CSV field
// and as a key of a JavaScript object or, beside other characters than letters and digits, near
// enough to one for the page to tell. Such a name is valid UTF-8 of at most 255 bytes without
// control characters, quotes, back quotes, '<', '/' and what neither Unix nor Active Directory
// allows ( [ ] : ; | = * ? ); it begins with none of '=', '+', '-', '@'. An account with any other
// name is treated as unknown, with one syslog line in the life of the process.
//
// The one exception is a domain's account as winbind names it by default, "DOM\name": it is handed
// out, and asked for, as "DOM/name". Asked for with the backslash it is unknown.
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
