#include "client/table.h"

#include <algorithm>

#include "client/text.h"

std::string Table::Text(const Terminal& terminal) const {
    constexpr size_t GAP = 2;
    std::vector<size_t> widths(m_headings.size());
    const auto widen = [&widths](const Row& row) {
        for (size_t i = 0; i < widths.size(); ++i) {
            widths[i] = std::max(widths[i], DisplayWidth(row[i].text));
        }
    };
    widen(m_headings);
    for (const Row& row : m_rows) widen(row);

    std::string text;
    const auto write = [&](const Row& row, bool is_heading) {
        for (size_t i = 0; i < widths.size(); ++i) {
            const Colour colour = is_heading ? Colour::BOLD : row[i].colour;
            text += terminal.Paint(colour, row[i].text);
            if (i + 1 < widths.size()) {
                text.append(widths[i] + GAP - DisplayWidth(row[i].text), ' ');
            }
        }
        text += '\n';
    };
    write(m_headings, true);
    for (const Row& row : m_rows) write(row, false);
    return text;
}
