// Rows of texts under headings, in aligned columns.
#pragma once

#include <string>
#include <vector>

#include "client/terminal.h"

class Table {
public:
    struct Cell {
        std::string text;
        Colour colour = Colour::PLAIN;

        Cell(std::string shown, Colour painted = Colour::PLAIN)
            : text(std::move(shown)), colour(painted) {}
        Cell(const char* shown) : text(shown) {}
    };
    using Row = std::vector<Cell>;

    explicit Table(Row headings) : m_headings(std::move(headings)) {}
    // As many cells as there are headings; texts are shown as they are (client/text.h makes names
    // safe).
    void Add(Row row) { m_rows.push_back(std::move(row)); }
    // The lines, each with its line end; no blanks behind the last column. No rows give the
    // headings alone.
    [[nodiscard]] std::string Text(const Terminal& terminal) const;

private:
    Row m_headings;
    std::vector<Row> m_rows;
};
