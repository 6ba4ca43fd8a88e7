// Text for the page formatter: what it would take as an order is written so that it is shown as it
// stands. Hyphens become those that can be copied into a shell.
#pragma once

#include <string>
#include <string_view>

// Safe within a line and at its start. A line end stays one.
[[nodiscard]] std::string RoffText(std::string_view text);
// The same in bold or italics. Empty for an empty text.
[[nodiscard]] std::string RoffBold(std::string_view text);
[[nodiscard]] std::string RoffItalic(std::string_view text);
