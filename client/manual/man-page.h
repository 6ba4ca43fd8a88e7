// Makes a manual page, as the system's page formatter takes it (man(7)).
#pragma once

#include <string>
#include <vector>

struct CommandInfo;

// What stands on a page besides the commands. All texts are plain.
struct ManPage {
    struct Entry {
        std::string term;
        std::string text;
    };
    struct Section {
        std::string title;  // "EXIT STATUS"
        std::vector<Entry> entries;
    };

    std::string name;     // "ferrixctl"
    int number = 1;       // of the part of the manual
    std::string summary;  // one line without a full stop; empty: what the program says of itself
    std::vector<std::string> description;  // paragraphs
    // Options of which exactly one is given: each has a line of its own in the synopsis.
    std::vector<std::string> forms;
    std::vector<Section> sections;      // behind the options and the commands
    std::vector<std::string> see_also;  // "ferrixd(8)"
};

// A page without options and commands.
[[nodiscard]] std::string PageText(const ManPage& page);
// A page with everything that `program` understands.
[[nodiscard]] std::string PageText(const ManPage& page, const CommandInfo& program);
