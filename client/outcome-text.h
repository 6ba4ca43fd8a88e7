// What an outcome of the daemon's work (utils/error-code.h) means to a person.
#pragma once

#include <string>

// A clause that goes on after ": ", as "the destination is full". A number that is no outcome is
// told as such.
[[nodiscard]] std::string OutcomeText(int code);
