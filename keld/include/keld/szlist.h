/* A list of texts, as enumerations give it. Threads: a list belongs to one thread at a time. */
#ifndef KELD_SZLIST_H
#define KELD_SZLIST_H

#ifdef __cplusplus
extern "C" {
#endif

typedef struct KLIBCSzList KLIBCSzList;

/* An empty list with room for `size` texts (it grows as needed), null on failure. */
KLIBCSzList* KLIBCSzListAlloc(int size);
/* The text at `index`, null from the end on. It lives until the list is changed or freed. */
const char* KLIBCSzListGet(const KLIBCSzList* list, int index);
/* Null is allowed. */
void KLIBCSzListFree(KLIBCSzList* list);

#ifdef __cplusplus
}
#endif
#endif
