// A log row as a sentence.
#pragma once

#include <string>
#include <string_view>

class LogInfo;

// A name as sentences show it: safe to print, and a double quote in it has a backslash before it,
// so that no name can end its own quotes.
[[nodiscard]] std::string NameInSentence(std::string_view name);

// The sentence, without a full stop. A row of a description that is not known here is told by its
// number and its parameters, one whose parameters are damaged by what is stored.
[[nodiscard]] std::string LogSentence(const LogInfo& row);
