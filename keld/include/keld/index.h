/* The media index. Threads: any. */
#ifndef KELD_INDEX_H
#define KELD_INDEX_H

#ifdef __cplusplus
extern "C" {
#endif

/* Asks the indexer to take in what lies at `path`. The numbers are the indexer's own; callers pass
 * 0, 3, 0, 0. Returns 0, negative when the path was not handed over. */
int KLIBKeldIndexAddEx(const char* path, int arg1, int arg2, int arg3, int arg4);

#ifdef __cplusplus
}
#endif
#endif
