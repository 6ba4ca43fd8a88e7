/* What the platform keeps beside a file: stored attributes and the archive bits. Threads: any. */
#ifndef KELD_EA_H
#define KELD_EA_H

#ifdef __cplusplus
extern "C" {
#endif

/* Drops the attributes that are stored for `path` apart from the file, which is gone already. `fd`
 * is -1, `flags` 0. Returns 0, also when there are none; negative on failure. */
int KELDEARemove(const char* path, int fd, int flags);

/* Sets the archive bits of a file or folder to `value`. Returns 0, negative on failure. A platform
 * without such bits succeeds and keeps nothing. */
int KELDArchiveBit(const char* path, int value);

#ifdef __cplusplus
}
#endif
#endif
