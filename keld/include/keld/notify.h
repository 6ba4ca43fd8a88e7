/* Desktop notifications, the hash of texts that carries their variables, and the host's name.
 *
 * Threads: a hash belongs to one thread at a time; all else may be called from any thread. */
#ifndef KELD_NOTIFY_H
#define KELD_NOTIFY_H

#ifdef __cplusplus
extern "C" {
#endif

/* A map from text to text. */
typedef struct KLIBCSzHash KLIBCSzHash;

/* An empty hash with room for `size` bytes of text (it grows as needed), null on failure. */
KLIBCSzHash* KLIBCSzHashAlloc(int size);
/* Sets a pair; both texts are copied. `*hash` may be replaced by another hash: the old pointer is
 * no longer good then. Returns 0; negative on failure, which leaves the hash as it was. */
int KLIBCSzHashSetValue(KLIBCSzHash** hash, const char* key, const char* value);
/* The value of `key`, null when there is none. It lives until the hash is changed or freed. */
const char* KLIBCSzHashGetValue(const KLIBCSzHash* hash, const char* key);
/* Null is allowed. */
void KLIBCSzHashFree(KLIBCSzHash* hash);

/* Delivers the notification `tag` with the variables of `hash` ("%TASKNAME%" and so on), which
 * stays the caller's. Returns 0; negative when it could not be delivered. */
int KELDSysNotifySendNotifiction(const char* tag, const KLIBCSzHash* hash);

/* Room for any host name: 64 bytes and the NUL. */
#define KELD_HOSTNAME_SIZE 65
/* Fills `buffer` of KELD_HOSTNAME_SIZE bytes with the box's name. Returns 0, below 0 on failure. */
int KELDLnxGetHostname(char* buffer);

#ifdef __cplusplus
}
#endif
#endif
