// The map of texts behind the opaque handle.
#pragma once

#include <keld/notify.h>

#include <map>
#include <string>

struct KLIBCSzHash {
    std::map<std::string, std::string> pairs;
};
