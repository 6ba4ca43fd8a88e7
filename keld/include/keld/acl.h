/* Access control lists of the appliance's file system. Threads: any.
 *
 * A platform without them says so with KELDACLIsSupport, and the other calls then fail: callers use
 * mode bits instead. */
#ifndef KELD_ACL_H
#define KELD_ACL_H

#ifdef __cplusplus
extern "C" {
#endif

typedef struct KELDACLEntry {
    int tag; /* who: KELD_ACL_TAG_... */
    unsigned id;
    unsigned permission; /* bits; 0x1FFF is everything */
    int inherit;
    int allow; /* 1 allows, 0 denies */
    int level;
} KELDACLEntry;

enum { KELD_ACL_TAG_ADMIN = 4, KELD_ACL_TAG_EVERYONE = 8 };

typedef struct KELDACL {
    int count;
    KELDACLEntry* entries;
} KELDACL;

/* A list of `count` zeroed entries, to be given to KELDACLFree; null on failure. */
KELDACL* KELDACLAlloc(int count);
/* Null is allowed. */
void KELDACLFree(KELDACL* acl);

/* Whether the file system has such lists: 1 or 0. `path`, or `fd` when it is not negative; `flags`
 * is 1. */
int KELDACLIsSupport(const char* path, int fd, int flags);
/* Reads the list of a file. Returns 0 and a list to be given to KELDACLFree; negative and a null
 * list on failure. */
int KELDACLGet(const char* path, int fd, KELDACL** acl);
/* Replaces the list of a file. Returns 0, negative on failure. */
int KELDACLSet(const char* path, int fd, const KELDACL* acl);

#ifdef __cplusplus
}
#endif
#endif
