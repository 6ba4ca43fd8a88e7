#include "manual/completion.h"

#include "manual/command-tree.h"

Offer OfferFor(const OptionInfo& option) {
    if (!option.values.empty()) return Offer::WORDS;
    if (option.value_name == "TASK") return Offer::TASKS;
    if (option.value_name == "INT" || option.value_name == "UINT" || option.value_name == "FLOAT") {
        return Offer::NOTHING;
    }
    return Offer::FILES;
}

bool CanListTasks(const CommandInfo& program) {
    return FindCommand(program, {"task", "list"}) != nullptr;
}

std::string ShellQuoted(const std::string& text) {
    return "'" + Replaced(text, "'", "'\\''") + "'";
}

std::string FunctionName(const std::string& path) {
    std::string name = "_" + path;
    for (char& c : name) {
        if (c == ' ' || c == '-') c = '_';
    }
    return name;
}

std::string Replaced(std::string text, const std::string& mark, const std::string& replacement) {
    for (size_t at = text.find(mark); at != std::string::npos;
         at = text.find(mark, at + replacement.size())) {
        text.replace(at, mark.size(), replacement);
    }
    return text;
}
