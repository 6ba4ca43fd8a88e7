/* Capabilities of the model. Threads: any. */
#ifndef KELD_SUPPORT_H
#define KELD_SUPPORT_H

#ifdef __cplusplus
extern "C" {
#endif

/* Whether the model has the feature `key`: 1 or 0; an unreadable list of capabilities is 0. */
int KLIBCSupportGet(const char* key);

#ifdef __cplusplus
}
#endif
#endif
