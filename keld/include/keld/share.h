/* Shares: the folders that the box serves, and plugged-in devices, which are a share each for as
 * long as they are mounted.
 *
 * Threads: any. Paths are absolute. Every answer tells the state of this moment: a device that is
 * no longer mounted is no share. */
#ifndef KELD_SHARE_H
#define KELD_SHARE_H

#ifdef __cplusplus
extern "C" {
#endif

#include <keld/szlist.h>
#include <stddef.h>

/* A share's record. Read its fields; it belongs to the platform and is given back whole. */
typedef struct KELDShare {
    const char* name; /* unique among the shares of this moment */
    const char* path; /* the share's root folder, without a slash at the end */
} KELDShare;

/* Finds a share by its name. Returns 0 and a record to be given to KELDShareFree; negative and a
 * null record when there is none, or on an error. */
int KELDShareGet(const char* name, KELDShare** share);
/* Null is allowed. */
void KELDShareFree(KELDShare* share);

/* Finds the share that holds `path`: of several, the one with the longest root; "/volume1/photos2"
 * is not inside "/volume1/photos". The path itself need not exist. Fills the share's name and its
 * root path. Returns 0; negative when no share holds the path or a buffer is too small. */
int KELDShareNamePathGet(const char* path, char* name, size_t name_size, char* share_path,
                         size_t share_path_size);

/* The path of the recycle bin of the share that holds `path`, whether or not the folder exists or
 * the bin is enabled. Returns 0; negative when no share holds the path or the buffer is too small.
 */
int KELDShareBinPathGet(const char* path, char* bin_path, size_t size);

/* Whether the share is locked now: `status` is 0 when its files can be reached, 1 while it is
 * encrypted and locked (or, on plain Linux, while what belongs on its folder is not mounted).
 * Returns 0, negative on failure. */
int KLIBShareIsEncryptedGet(const KELDShare* share, int* status);
/* Whether the share is of the kind that can be locked: `status` is 0 when it is, 1 when not.
 * Returns 0, negative on failure. */
int KLIBShareIsEncryptionGet(const KELDShare* share, int* status);

/* `status` is 1 when removed files go to the share's recycle bin, else 0. Returns 0, negative on
 * failure. */
int KLIBShareRecycleStatusGet(const KELDShare* share, int* status);
/* `status` is 1 when only administrators may enter the bin, else 0. Returns 0, negative on failure.
 */
int KLIBShareRecycleAdminOnlyStatusGet(const KELDShare* share, int* status);

/* Kinds of shares, to be added. */
enum { KELD_SHARE_TYPE_INTERNAL = 1, KELD_SHARE_TYPE_DEVICE = 2, KELD_SHARE_TYPE_ALL = 3 };
/* The names of the shares of these kinds, sorted. Returns their number and a list to be given to
 * KLIBCSzListFree; negative and a null list on an error. */
int KELDShareDBEnumTypeMatched(int types, KLIBCSzList** names);

/* Rights of a user on a share. */
enum { KELD_SHARE_RIGHT_NONE = 0, KELD_SHARE_RIGHT_READ = 1, KELD_SHARE_RIGHT_WRITE = 2 };
/* The right of `user` (a login name) on the share. Returns 0; negative when the user is unknown. */
int KLIBShareUserRightGet(const KELDShare* share, const char* user, int* right);

/* Whether the share was made read-only by `owner` for the reason `key`. Returns 1 or 0, negative
 * when the share is unknown. */
int KELDShareAttrReadOnlyIsRegBy(const char* share_name, const char* owner, const char* key);

#ifdef __cplusplus
}
#endif
#endif
