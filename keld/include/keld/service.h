/* Services of the box and its own event log. Threads: any. */
#ifndef KELD_SERVICE_H
#define KELD_SERVICE_H

#ifdef __cplusplus
extern "C" {
#endif

/* Each gives 1 for yes, 0 for no, negative when it cannot be told. */
int KLIBServiceIsEnabled(const char* service);
/* The box takes its users from a directory server. */
int KELDLDAPIsBinded(void);
/* The box is a member of a Windows domain. */
int KELDWinsIsJoined(void);
/* Users have home folders in the share "homes". */
int KELDServiceUserHomeIsEnabled(void);

/* Events of KELDLogSet1. */
enum { KELD_LOG_FERRIX_STARTED = 0x11b01050, KELD_LOG_FERRIX_STOPPED = 0x11b01051 };
/* Adds an event to the log that the owner of the box reads: the event `code`, with up to four texts
 * that belong to it. `type` and `level` are 1, which is information. Returns 0, negative on
 * failure. */
int KELDLogSet1(int type, int level, unsigned code, const char* text1, const char* text2,
                const char* text3, const char* text4);

#ifdef __cplusplus
}
#endif
#endif
