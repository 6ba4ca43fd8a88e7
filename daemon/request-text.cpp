#include "daemon/request-text.h"

#include "ipc/pobject.h"

std::string RequestText(const PObject& request, const char* key) {
    std::string text = request[key].AsString();
    const size_t end = text.find('\0');
    if (end != std::string::npos) text.resize(end);
    return text;
}
