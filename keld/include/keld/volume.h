/* Volumes: the file systems of the box itself, and those of plugged-in devices. Threads: any. */
#ifndef KELD_VOLUME_H
#define KELD_VOLUME_H

#ifdef __cplusplus
extern "C" {
#endif

#include <stddef.h>

/* One volume. A list is linked through `next`; all texts belong to the list. */
typedef struct KELDMountVolInfo {
    const char* mount_path;  /* without a slash at the end */
    const char* device_path; /* "/dev/sdb1"; for a file system without a device, its source */
    int is_mounted;          /* 1 when the volume can be used */
    int is_writable;         /* 1 when its file system is not mounted read-only */
    int is_internal;         /* 1 for a volume of the box, 0 for plugged-in storage */
    struct KELDMountVolInfo* next;
} KELDMountVolInfo;

/* Kinds of volumes, to be added; 0 is all. */
enum { KELD_MOUNT_VOL_INTERNAL = 1, KELD_MOUNT_VOL_REMOVABLE = 4 };

/* The volumes of these kinds, as a list to be given to KELDMountVolInfoFree. `reserved` is 0.
 * Null is an empty list when KLIBCErrGet() then gives KELDERR_SUCCESS (this call clears the state
 * first), else a failure. Removable volumes are mounted ones only; a device is listed once for each
 * place where it is mounted. */
KELDMountVolInfo* KELDMountVolAllEnum(int reserved, int kinds);

/* The volume whose root is `path`, as a list of one, or null when there is none. */
KELDMountVolInfo* KELDMountVolInfoGet(const char* path);

/* Frees a whole list; null is allowed. */
void KELDMountVolInfoFree(KELDMountVolInfo* list);

/* The root of the volume that holds `path`: for a path inside a share, the volume of that share
 * (the folder that the share lies in). The path need not exist. Returns 0; negative when no volume
 * holds it or the buffer is too small. */
int VolumePathParseEx(const char* path, char* volume_path, size_t size);

/* The device of the volume or device mounted on `volume_path`, "/dev/sdb1". Returns 0; negative
 * when nothing is mounted there, or its file system has no device. */
int KELDVolPathToDevPath(const char* volume_path, char* device_path, size_t size);

#ifdef __cplusplus
}
#endif
#endif
