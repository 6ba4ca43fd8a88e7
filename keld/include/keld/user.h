/* Users and groups of the box. Threads: any. */
#ifndef KELD_USER_H
#define KELD_USER_H

#ifdef __cplusplus
extern "C" {
#endif

#include <keld/szlist.h>
#include <stddef.h>
#include <sys/types.h>

typedef struct KELDUser {
    const char* name;
    uid_t uid;
    gid_t gid;
    const char* home;
} KELDUser;

/* Finds a user. Returns 0 and a record to be given to KELDUserFree; negative and a null record when
 * there is no such user, or on an error. */
int KELDUserGet(const char* name, KELDUser** user);
int KELDUserGetByUID(uid_t uid, KELDUser** user);
/* Null is allowed. */
void KELDUserFree(KELDUser* user);

/* Whether the account has run out: 1 or 0; negative when that cannot be told. */
int KELDUserCheckExpired(const KELDUser* user);

/* The name under which the system knows the login name `login` (which may be in another case or
 * carry a domain). Returns 0; negative when there is no such user or the buffer is too small. */
int KELDUserLoginNameConvert(const char* login, char* name, size_t size);

typedef struct KELDGroup {
    const char* name;
    gid_t gid;
} KELDGroup;

/* Finds a group. Returns 0 and a record to be given to KELDGroupFree; negative and a null record
 * when there is no such group, or on an error. */
int KELDGroupGetByGID(gid_t gid, KELDGroup** group);
/* Null is allowed. */
void KELDGroupFree(KELDGroup* group);

/* Adds the names of the group's members, those included who have it as their first group, to
 * `*members`, a list from KLIBCSzListAlloc, which may be replaced. Returns the number of names that
 * were added, negative on an error. */
int KELDGroupListMember(const char* group_name, KLIBCSzList** members);

/* Whether the user is an administrator: 1 or 0; negative when there is no such user. */
int KLIBGroupIsAdminGroupMemByUid(uid_t uid);

#ifdef __cplusplus
}
#endif
#endif
