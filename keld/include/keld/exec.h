/* Running programs. Threads: any.
 *
 * A program is run as it is named, without a shell, with no other descriptors than 0 to 2 (on
 * /dev/null), default signals and an empty signal mask. */
#ifndef KELD_EXEC_H
#define KELD_EXEC_H

#ifdef __cplusplus
extern "C" {
#endif

#include <sys/types.h>

#if defined(__GNUC__)
#define KELD_SENTINEL __attribute__((sentinel))
#else
#define KELD_SENTINEL
#endif

/* Runs `program` (absolute path) with the arguments that follow, ended by a null pointer, and waits
 * for its end. Returns its exit status, 0 to 255; negative when it could not be started, was ended
 * by a signal, or was killed because it took longer than the platform allows (10 seconds on plain
 * Linux, but for /bin/cp and /bin/mv). */
int KLIBCExec(const char* program, ...) KELD_SENTINEL;

/* The same without waiting, and without a limit of time. Returns 0 when the program was started,
 * else negative. The child is no child of the caller that would have to be waited for. */
int KLIBCBackgroundExec(const char* program, ...) KELD_SENTINEL;

/* The number in a pid file: above 0; negative when the file is missing or holds no pid. */
pid_t KLIBCReadPidFile(const char* path);

#ifdef __cplusplus
}
#endif
#endif
