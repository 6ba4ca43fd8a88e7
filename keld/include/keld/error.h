/* Error state of the platform: what the last failed call of this thread met, and where.
 *
 * Threads: the state belongs to the calling thread. A call that fails sets it; a call that succeeds
 * leaves it as it was, unless its comment says that it clears it. Read it right after the failure.
 */
#ifndef KELD_ERROR_H
#define KELD_ERROR_H

#ifdef __cplusplus
extern "C" {
#endif

/* The values are part of the interface and are never renumbered. Some meanings have two values:
 * both are to be understood, the first of a pair is what the plain-Linux platform gives. */
enum {
    KELDERR_SUCCESS = 0x0000,
    KELDERR_NO_PERMISSION = 0x0300,
    KELDERR_NO_PERMISSION_ACL = 0x8400,
    KELDERR_SRC_MISS = 0x0600,
    KELDERR_SRC_MISS_PATH = 0x0700,
    KELDERR_DST_EXISTS = 0xA300,
    KELDERR_DST_EXISTS_NAME = 0x0800,
    KELDERR_INVALID_ARGUMENT = 0x0D00,
    KELDERR_NO_SPACE = 0x2400,
    KELDERR_QUOTA_FULL = 0x2900,
    KELDERR_FILE_OPERATION = 0x3B00,
    KELDERR_IO = 0x6C00,
    KELDERR_SYSTEM = 0x8000,
    KELDERR_DST_TYPE_CONFLICT = 0xA200,
    KELDERR_FILE_TOO_LARGE = 0xA400,
    KELDERR_NAME_NOT_SUPPORTED = 0xA500,
    KELDERR_NAME_TOO_LONG = 0xC300,
    KELDERR_CANCELLED = 0xA600
};

/* The value of the last failure of this thread, KELDERR_SUCCESS when there was none. */
int KLIBCErrGet(void);
/* The source file and line that reported it; "" and 0 when there was none. The text is static. */
const char* KLIBCErrorGetFile(void);
int KLIBCErrorGetLine(void);

#ifdef __cplusplus
}
#endif
#endif
