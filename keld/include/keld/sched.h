/* Task scheduler: entries that run a command on a timetable.
 *
 * Threads: any, an entry object being used by one at a time; several processes may use the store at
 * once. Texts are bytes that end with a zero; they are copied. Results are 0, negative on failure,
 * unless said otherwise. A null entry is a failure.
 *
 * On plain Linux each entry is a file of its own in /var/lib/keld/sched. An entry that is enabled,
 * listable, and has a command and a timetable stands as one or more lines in
 * /etc/cron.d/keld-sched. That no cron daemon is installed or running is no error. */
#ifndef KELD_SCHED_H
#define KELD_SCHED_H

#ifdef __cplusplus
extern "C" {
#endif

#include <stdbool.h>
#include <stddef.h>

typedef struct KELDSchedTask KELDSchedTask;

/* A new entry without an id: all texts empty, owner 0 (root), listable, every other flag 0, without
 * a timetable. Null when there is no memory. To be given to KELDSchedTaskFree. */
KELDSchedTask* KELDSchedTaskAlloc(void);
/* Frees an entry from KELDSchedTaskAlloc; null is allowed. Entries of a list belong to the list. */
void KELDSchedTaskFree(KELDSchedTask* entry);

/* Fills `entry` from the store. A failure (no such id, a damaged file) leaves it as it was. */
int KELDSchedTaskLoad(int id, KELDSchedTask* entry);
/* Stores the entry. A new one gets its id: positive, and never given twice. Of a stored one, the
 * fields that were set since it was loaded are written, so that two who change different fields do
 * not undo each other; one that has been removed meanwhile is a failure. When it fails, what was
 * stored before stays in force. Fails too for a command that a line of a timetable cannot hold (a
 * control character such as a newline, a backslash, or more than 900 bytes) and for an owner that
 * is no user of the box. */
int KELDSchedTaskSave(KELDSchedTask* entry);
/* Removes a stored entry; an id that is not there is a failure. */
int KELDSchedTaskRemove(int id);

/* Entries that `filter` accepts (returns nonzero for), in the order of their ids; a null filter
 * accepts all. The result is their number, and `list` is the first, or null for none; negative and
 * null on failure. Damaged files are left out, with a line in the log. The entries may be changed
 * and saved. */
typedef int (*KELDSchedFilter)(const KELDSchedTask* entry);
int KELDSchedTaskListGet(KELDSchedTask** list, KELDSchedFilter filter);
/* The entry after this one in its list, null at the end. */
KELDSchedTask* KELDSchedTaskNext(const KELDSchedTask* entry);
/* Frees a whole list by its first entry; null is allowed. */
void KELDSchedTaskListFree(KELDSchedTask* list);

/* Fields. They reach the store with the next KELDSchedTaskSave. */
int KELDSchedCTaskSetApp(KELDSchedTask* entry, const char* app); /* id of the application */
int KELDSchedCTaskSetAppName(KELDSchedTask* entry, const char* name);
int KELDSchedCTaskSetName(KELDSchedTask* entry, const char* name);
int KELDSchedCTaskSetAction(KELDSchedTask* entry, const char* action);
int KELDSchedCTaskSetCommand(KELDSchedTask* entry, const char* command); /* for /bin/sh */
int KELDSchedCTaskSetState(KELDSchedTask* entry, int enabled);
int KELDSchedCTaskSetCanRunAppSameTime(KELDSchedTask* entry, int flag);
int KELDSchedCTaskSetCanRunTaskSameTime(KELDSchedTask* entry, int flag);
int KELDSchedCTaskSetCanRunFromUI(KELDSchedTask* entry, int flag);
int KELDSchedCTaskSetOwner(KELDSchedTask* entry, int uid); /* whom the command runs as */
int KELDSchedCTaskSetCanEditName(KELDSchedTask* entry, int flag);
int KELDSchedCTaskSetCanEditOwner(KELDSchedTask* entry, int flag);
int KELDSchedCTaskSetCanDeleteFromUI(KELDSchedTask* entry, int flag);
int KELDSchedCTaskSetListable(KELDSchedTask* entry, int flag);

/* The id; negative for an entry that was never stored. */
int KELDSchedCTaskGetID(int* id, const KELDSchedTask* entry);
/* Fails when the text and its zero need more than `size` bytes. */
int KELDSchedCTaskGetApp(char* buffer, size_t size, const KELDSchedTask* entry);
/* 1 or 0. */
int KELDSchedTaskIsListable(const KELDSchedTask* entry);

/* clang-format off */
/* Takes the timetable out of `json` (UTF-8), an object with the member "schedule", itself an
 * object. All its members are optional; null counts as not given, and members not named here are
 * passed over.
 *
 *   "hour"            0 to 23, default 0
 *   "min"             0 to 59, default 0
 *   "date_type"       0 on days of the week (default), 1 on a date
 *   "week_name"       with date_type 0: the days, "0" Sunday to "6" Saturday, with commas between,
 *                     as in "1,2,5"; default "", which is every day
 *   "date"            with date_type 1: "YYYY/M/D", years 1970 to 9999; has to be given then
 *   "repeat"          with date_type 1: how it goes on from that date:
 *                         0              once (default)
 *                         -1 or 1001     every day
 *                         1002           every week, on the date's day of the week
 *                         1, 2, 3, 4, 6  after so many months, on the date's day of the month
 *                         12             every year
 *                     A month without that day (the 31st, 29 February) is passed over. With
 *                     date_type 0 it has no meaning, but must be one of these
 *   "repeat_hour"     again after so many hours on the same day, 0 to 23, default 0
 *   "repeat_min"      and so many minutes, 0 to 59, default 0; both 0 is once on that day
 *   "last_work_hour"  the last hour of the day in which a repeat may begin, "hour" to 23 (0 to 23
 *                     without repeats), default 23
 *
 * Numbers are integers. An object without any of these members takes the timetable away: the entry
 * is kept, and never runs. Returns false, the entry unchanged, for a text that is no such object, a
 * member of another type or a value out of its range. */
/* clang-format on */
bool KELDSchedTaskConvertFromJson_Schedule(const char* json, KELDSchedTask* entry);

#ifdef __cplusplus
}
#endif
#endif
