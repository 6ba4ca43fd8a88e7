/* Copy of one file.
 *
 * Threads: any number of copies may run at once, each with an argument object of its own. */
#ifndef KELD_COPY_H
#define KELD_COPY_H

#ifdef __cplusplus
extern "C" {
#endif

#include <stdint.h>

/* Eleven 32-bit words. The plain-Linux platform reads the three that have a name; the others are
 * passed as noted, and have no meaning there. */
typedef struct KELDCopyOptions {
    int32_t overwrite; /* 1 replaces an existing file, -1 refuses it */
    int32_t word1;     /* 0 */
    int32_t word2;     /* 1 */
    int32_t word3;     /* 0 */
    int32_t word4;     /* 1 */
    int32_t word5;     /* 0 */
    int32_t word6;     /* 0 */
    int32_t word7;     /* 0 */
    int32_t owner;     /* user id of the new file, -1 leaves it */
    int32_t group;     /* group id of the new file, -1 leaves it */
    int32_t word10;    /* 0 */
} KELDCopyOptions;

/* What a copy can be given besides: opaque. */
typedef struct KELDCopyTHRArgs KELDCopyTHRArgs;
/* A new object without a callback, to be given to KELDCopyTHRArgsFree; null when there is no
 * memory. */
KELDCopyTHRArgs* KELDCopyTHRArgsAlloc(void);
/* Null is allowed. Not while a copy uses the object. */
void KELDCopyTHRArgsFree(KELDCopyTHRArgs* args);

/* Asked during a copy whether it shall stop: nonzero stops it. */
typedef int (*KELDCopyIsCancel)(void* user_data);
/* Sets the callback, null for none; `user_data` is handed to it as it is. It is called on the
 * thread that copies, at the start and then at least once in 8 MiB. Returns 0; negative for a null
 * object. */
int KELDCopyTHRSetCallbackIsCancel(KELDCopyTHRArgs* args, KELDCopyIsCancel callback,
                                   void* user_data);

/* clang-format off */
/* Copies the regular file `from` to the path `to`, whose folder must exist. Both are absolute; they
 * may be longer than PATH_MAX below the root of a share or a device. `args` may be null.
 *
 * The new file appears under its name in one step and whole, or not at all: after a failure, a
 * cancel or a crash `to` is what it was. It gets the permission bits of the source without setuid,
 * setgid and sticky bit, and the owner of the options where the file system has owners. Holes stay
 * holes where the file system has them. The caller sets its time stamps; on plain Linux it has the
 * source's time of change from the start. It is not yet on the disk: the caller flushes.
 *
 * No symbolic link is followed as the last component, and below the root of the share or device
 * that holds a path none at all. A source that changed while it was read is not taken: the copy
 * fails.
 *
 * Returns 0; negative on failure, with these values of KLIBCErrGet:
 *   KELDERR_SRC_MISS_PATH       there is no source
 *   KELDERR_INVALID_ARGUMENT    the source is no regular file (a link, a folder, a FIFO), a link
 *                               stands on the way to it, or a path is null or empty
 *   KELDERR_DST_TYPE_CONFLICT   `to` exists and is no regular file; asked before the next
 *   KELDERR_DST_EXISTS          `to` exists and may not be replaced
 *   KELDERR_CANCELLED           the callback asked for it
 *   KELDERR_NO_SPACE, KELDERR_QUOTA_FULL
 *   KELDERR_NO_PERMISSION       also a read-only file system
 *   KELDERR_FILE_TOO_LARGE      the destination's file system takes no file of this size
 *   KELDERR_NAME_NOT_SUPPORTED, KELDERR_NAME_TOO_LONG   it does not take the name
 *   KELDERR_IO                  also a device that is gone
 *   KELDERR_SYSTEM              no memory or no descriptors
 *   KELDERR_FILE_OPERATION      anything else: no folder to copy into, a symbolic link on the way
 *                               there, a source that changed meanwhile */
/* clang-format on */
int KELDFileCopy_r(const char* from, const char* to, const KELDCopyOptions* options,
                   KELDCopyTHRArgs* args);

#ifdef __cplusplus
}
#endif
#endif
