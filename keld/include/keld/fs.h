/* File systems and paths. Threads: any. */
#ifndef KELD_FS_H
#define KELD_FS_H

#ifdef __cplusplus
extern "C" {
#endif

#include <stddef.h>

/* The file system that holds a path. */
typedef struct KELDFSInfo {
    const char* mount_path;
    const char* device_path; /* what quotactl(2) takes */
    const char* type;        /* "ext4" */
} KELDFSInfo;

/* Returns 0 and a record to be given to FSInfoFree; negative and a null record when the path does
 * not exist, or on an error. */
int FSInfoGet(const char* path, KELDFSInfo** info);
/* Null is allowed. */
void FSInfoFree(KELDFSInfo* info);

/* Whether a file system is mounted on `path` itself: 1 or 0; negative when the mount table cannot
 * be read. */
int KELDFSHasMountPoint(const char* path);

/* The full path of a path as users see it, "/photos/2024" for a share "photos". Returns 0; negative
 * when its first component is no share or the buffer is too small. The rest need not exist. */
int KELDPathResolve(const char* display_path, char* full_path, size_t size);

#ifdef __cplusplus
}
#endif
#endif
