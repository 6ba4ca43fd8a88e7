// The rules of rotation a second time, written from their tables alone and without a thought for
// speed: what is to go, in the order of its removal.
#pragma once

#include <string>
#include <vector>

#include "strategy/version-info.h"

// `versions` stand with the newest first. `policy` is 1 or 2.
std::vector<std::string> NaiveRotation(const std::vector<VersionInfo>& versions, uint32_t now,
                                       uint64_t max_version_count, int policy);
