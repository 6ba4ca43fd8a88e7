#include "host/sz-hash.h"

#include <memory>

#include "host/host-error.h"

using keld_host::Fail;

KLIBCSzHash* KLIBCSzHashAlloc(int size) {
    if (size < 0) {
        Fail(KELDERR_INVALID_ARGUMENT);
        return nullptr;
    }
    return std::make_unique<KLIBCSzHash>().release();
}

int KLIBCSzHashSetValue(KLIBCSzHash** hash, const char* key, const char* value) {
    if (hash == nullptr || *hash == nullptr || key == nullptr || value == nullptr) {
        return Fail(KELDERR_INVALID_ARGUMENT);
    }
    (*hash)->pairs[key] = value;
    return 0;
}

const char* KLIBCSzHashGetValue(const KLIBCSzHash* hash, const char* key) {
    if (hash == nullptr || key == nullptr) return nullptr;
    const auto found = hash->pairs.find(key);
    return found == hash->pairs.end() ? nullptr : found->second.c_str();
}

void KLIBCSzHashFree(KLIBCSzHash* hash) { delete hash; }
