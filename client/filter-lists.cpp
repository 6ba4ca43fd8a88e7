#include "client/filter-lists.h"

#include "client/exit-status.h"
#include "client/text.h"
#include "ipc/pobject.h"

namespace {

const std::vector<std::string> EVERYTHING = {"*"};

PObject List(const std::vector<std::string>& texts) {
    PObject::array_type list;
    for (const std::string& text : texts) list.emplace_back(text);
    PObject value;
    value = list;
    return value;
}

void CheckNames(const std::vector<std::string>& names) {
    for (const std::string& name : names) {
        if (name.empty() || name.find('/') != std::string::npos) {
            throw CommandError(EXIT_USAGE, "\"" + Printable(name) +
                                               "\" is no name of a file or folder: paths are not "
                                               "compared, only single names");
        }
    }
}

// ".jpg" and "*.jpg" are what people write for the extension "jpg".
std::vector<std::string> Extensions(std::vector<std::string> texts) {
    for (std::string& text : texts) {
        if (text.size() > 1 && text.front() == '*') text.erase(0, 1);
        if (text.size() > 1 && text.front() == '.') text.erase(0, 1);
    }
    return texts;
}

std::vector<std::string> Joined(const std::vector<std::string>& first,
                                const std::vector<std::string>& second) {
    std::vector<std::string> joined = first;
    joined.insert(joined.end(), second.begin(), second.end());
    return joined;
}

}  // namespace

bool FilterOptions::IsEmpty() const {
    return exclude_names.empty() && exclude_extensions.empty() && only_names.empty() &&
           only_extensions.empty();
}

void AddFilterOptions(CLI::App& command, FilterOptions& options) {
    const auto add = [&command](const char* name, std::vector<std::string>& list,
                                const char* text) {
        command.add_option(name, list, text)->delimiter(',')->type_name("NAME,...");
    };
    add("--exclude", options.exclude_names, "Files and folders with these names are not copied");
    add("--exclude-ext", options.exclude_extensions,
        "Files with these extensions are not copied: \"tmp,bak\"");
    add("--only", options.only_names,
        "Only files with these names, and what lies in folders with these names, are copied");
    add("--only-ext", options.only_extensions,
        "Only files with these extensions are copied: \"jpg,cr2\"");
}

void SetFilterLists(const FilterOptions& options, PObject& request) {
    CheckNames(options.exclude_names);
    CheckNames(options.only_names);
    const std::vector<std::string> exclude = Extensions(options.exclude_extensions);
    const std::vector<std::string> only = Extensions(options.only_extensions);
    CheckNames(exclude);
    CheckNames(only);
    const bool takes_all = options.only_names.empty() && only.empty();
    request["black_name"] = List(options.exclude_names);
    request["black_ext"] = List(exclude);
    request["white_name"] = List(takes_all ? EVERYTHING : options.only_names);
    request["white_ext"] = List(takes_all ? EVERYTHING : only);
    // What a client shows as the person's own entries.
    request["custom_name"] = List(Joined(options.exclude_names, options.only_names));
    request["custom_ext"] = List(Joined(exclude, only));
}
