/* Recycle bin of a share: removed files and folders are moved into the folder "#recycle" of the
 * share, under the same relative path.
 *
 * Threads: any. Nothing that is in the bin is ever replaced: if the name is taken, the newcomer
 * gets a number, "a (1).txt", a folder "d (1)". Folders of the path are made in the bin as needed,
 * like the originals. A file or folder that cannot be moved stays where it is.
 *
 * `share_path` is the share's root folder, `relative_path` what is to be moved, below it. No
 * symbolic link below the root is followed; a link is moved itself. Refused are an empty relative
 * path (the share itself), one that holds "..", "#recycle" and what lies in it, and what lies on
 * another file system than the bin (a mount point, or below one).
 *
 * Return 0; negative on failure, with these values of KLIBCErrGet:
 *   KELDERR_SRC_MISS_PATH      there is no such file or folder
 *   KELDERR_INVALID_ARGUMENT   a refused path, or of the other kind: a folder given to the first
 * call, something else to the second KELDERR_FILE_OPERATION     on another file system than the
 * bin, or a symbolic link in the way KELDERR_NO_PERMISSION, KELDERR_NO_SPACE, KELDERR_QUOTA_FULL,
 * KELDERR_IO, KELDERR_SYSTEM */
#ifndef KELD_RECYCLE_H
#define KELD_RECYCLE_H

#ifdef __cplusplus
extern "C" {
#endif

/* Moves anything but a folder. */
int KELDRecycleUnlinkFileWithSharePath(const char* share_path, const char* relative_path);

/* Moves a folder with all it holds. `reserved` is 0. `admin_only` is 1 when only administrators may
 * enter the bin, else 0: it decides the mode of a bin that has to be made, 0700 or 0777. */
int KELDRecycleRmDirWithSharePath(const char* share_path, const char* relative_path, int reserved,
                                  int admin_only);

#ifdef __cplusplus
}
#endif
#endif
