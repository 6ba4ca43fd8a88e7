#include "client/help-formatter.h"

#include <memory>
#include <sstream>
#include <string>

namespace {

constexpr size_t COLUMNS = 80;
constexpr size_t NAME_COLUMNS = 28;

// The words in lines of at most COLUMNS, each but the first behind `indent` blanks; the first one
// has `used` columns before it.
std::string Wrapped(const std::string& text, size_t indent, size_t used) {
    std::string wrapped;
    std::istringstream words(text);
    size_t column = used;
    for (std::string word; words >> word;) {
        const bool is_first = wrapped.empty();
        if (!is_first && column + 1 + word.size() > COLUMNS) {
            wrapped += '\n' + std::string(indent, ' ');
            column = indent;
        } else if (!is_first) {
            wrapped += ' ';
            ++column;
        }
        wrapped += word;
        column += word.size();
    }
    return wrapped;
}

std::string FirstSentence(const std::string& text) {
    for (const char* end : {". ", ": "}) {
        const size_t at = text.find(end);
        if (at != std::string::npos && at + NAME_COLUMNS < COLUMNS) return text.substr(0, at) + ".";
    }
    return text.substr(0, text.find(". ")) + (text.find(". ") == std::string::npos ? "" : ".");
}

// A name in its column, and what it means in the next.
std::string Entry(const std::string& name, const std::string& meaning) {
    std::string line = "  " + name;
    if (line.size() + 2 > NAME_COLUMNS) {
        line += '\n' + std::string(NAME_COLUMNS, ' ');
    } else {
        line.append(NAME_COLUMNS - line.size(), ' ');
    }
    return line + Wrapped(meaning, NAME_COLUMNS, NAME_COLUMNS) + '\n';
}

class HelpFormatter : public CLI::Formatter {
public:
    std::string make_description(const CLI::App* app) const override {
        return Wrapped(app->get_description(), 0, 0) + "\n\n";
    }

    std::string make_subcommand(const CLI::App* command) const override {
        return Entry(command->get_name(), FirstSentence(command->get_description()));
    }

    std::string make_option(const CLI::Option* option, bool is_positional) const override {
        std::string name = make_option_name(option, is_positional);
        if (option->get_type_size() != 0 && !is_positional) name += ' ' + option->get_type_name();
        std::string meaning = option->get_description();
        if (!option->get_default_str().empty())
            meaning += " (default " + option->get_default_str() + ")";
        return Entry(name, meaning);
    }
};

void Use(CLI::App& command, const std::shared_ptr<CLI::FormatterBase>& formatter) {
    command.formatter(formatter);
    for (CLI::App* below : command.get_subcommands({})) Use(*below, formatter);
}

}  // namespace

void UseHelpFormatter(CLI::App& program) { Use(program, std::make_shared<HelpFormatter>()); }
