// User accounts, through the system's name service.
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
// -1 when there is no such account, with `*user` null.
int VORNUserGet(const char* name, VORNUser** user);
int VORNUserGetByUID(uid_t uid, VORNUser** user);
// Accepts null.
void VORNUserFree(VORNUser* user);

// The ids of the account `name`; `gid` may be null. 0, or -1 when there is no such account.
// Look-ups, failed ones too, are cached for the process.
int VORNUserGetUGID(const char* name, uid_t* uid, gid_t* gid);

#ifdef __cplusplus
}
#endif

#endif
