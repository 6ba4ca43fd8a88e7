// The list of texts behind the opaque handle.
#pragma once

#include <keld/szlist.h>

#include <string>
#include <vector>

struct KLIBCSzList {
    std::vector<std::string> items;
};
