// The parameters of a log row, taken out of the form in which the row stores them.
#pragma once

#include <optional>
#include <string>
#include <vector>

// The texts of a JSON array of strings. None when `stored` is anything else: a damaged row.
[[nodiscard]] std::optional<std::vector<std::string>> LogParameters(const std::string& stored);
