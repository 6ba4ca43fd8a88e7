// Names in commands that a person is advised to type.
#pragma once

#include <string>
#include <string_view>

// The bytes as one word of bash or zsh, whatever they are: pasted into a shell it is just this
// text, and a terminal can show it. Threads: any.
[[nodiscard]] std::string ShellWord(std::string_view bytes);
