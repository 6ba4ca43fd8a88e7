/* Key files: text files of lines key="value".
 *
 * There are no escapes: a value is what stands between the quotes, byte for byte, so it holds no
 * quote, newline or carriage return. A line that starts with '#', and any other line that is not
 * understood, is a comment and is kept. Of several lines for one key the first counts.
 *
 * Threads: any. A write replaces the file in one step, so that a reader, in this process or
 * another, sees the old content or the new, never half of one. Two writers of one file at the same
 * time need a lock of their own, or one of the changes may be lost. */
#ifndef KELD_KEYFILE_H
#define KELD_KEYFILE_H

#ifdef __cplusplus
extern "C" {
#endif

#include <stddef.h>

/* How a key's line is written; the one format that callers need. */
#define KELD_KEY_VALUE_FORMAT "%s=\"%s\"\n"

/* Reads the value of `key` into `buffer` of `size` bytes, with a NUL at the end. `flags` is 0.
 * Returns 1 when the key is there (its value may be empty), 0 when the key or the file is missing,
 * negative on an error: unreadable file, no room in the buffer. Then, and when the key is
 * missing, the buffer holds an empty text. */
int KLIBCFileGetKeyValue(const char* path, const char* key, char* buffer, size_t size, int flags);

/* Sets the line of `key`, or adds it at the end; the file is made when it is missing (its folder is
 * not). The file is then readable by all and writable by its owner alone. `format` says how the
 * line is written, with two "%s" for key and value; null is KELD_KEY_VALUE_FORMAT.
 * Returns 0; negative on an error, also when the file could not hold the key or the value so that
 * they are read back alike (KELDERR_INVALID_ARGUMENT). After a failure the file is unchanged. */
int KLIBCFileSetKeyValue(const char* path, const char* key, const char* value, const char* format);

/* Whether the value of `key` is `value`, in the same case. Returns 1, 0 (also for a missing key or
 * file), negative on an error. */
int KLIBCFileCheckKeyValue(const char* path, const char* key, const char* value);

/* Removes every line of `key`. Returns 1 when one was there, 0 when the key or the file is missing,
 * negative on an error, which leaves the file unchanged. */
int KLIBCFileRemoveKey(const char* path, const char* key);

/* Whether there is something under this path, links followed: 1 or 0. */
int KLIBCFileExist(const char* path);

#ifdef __cplusplus
}
#endif
#endif
