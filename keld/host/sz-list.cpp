#include "host/sz-list.h"

#include <memory>

KLIBCSzList* KLIBCSzListAlloc(int size) {
    auto list = std::make_unique<KLIBCSzList>();
    if (size > 0) list->items.reserve(static_cast<size_t>(size));
    return list.release();
}

const char* KLIBCSzListGet(const KLIBCSzList* list, int index) {
    if (list == nullptr || index < 0 || static_cast<size_t>(index) >= list->items.size()) {
        return nullptr;
    }
    return list->items[static_cast<size_t>(index)].c_str();
}

void KLIBCSzListFree(KLIBCSzList* list) { delete list; }
