// The lists and hashes of texts that enumerations and notifications use.
#pragma once

#include <keld/notify.h>
#include <keld/szlist.h>

#include <map>
#include <string>
#include <vector>

struct KLIBCSzList {
    std::vector<std::string> texts;
};

struct KLIBCSzHash {
    std::map<std::string, std::string> pairs;
};
