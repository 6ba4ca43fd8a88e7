#include "manual/man-page.h"

#include <algorithm>

#include "manual/command-tree.h"
#include "manual/roff.h"

namespace {

// A synopsis with more options than these is no help any more.
constexpr size_t SHOWN_OPTIONS = 4;

bool Contains(const std::vector<std::string>& texts, const std::string& text) {
    return std::find(texts.begin(), texts.end(), text) != texts.end();
}

std::string Joined(const std::vector<std::string>& texts, const char* separator) {
    std::string joined;
    for (const std::string& text : texts) joined += (joined.empty() ? "" : separator) + text;
    return joined;
}

std::string Upper(std::string text) {
    for (char& c : text) c = static_cast<char>(toupper(static_cast<unsigned char>(c)));
    return text;
}

void WriteParagraph(std::string& page, const std::string& text) {
    page += ".PP\n" + RoffText(text) + "\n";
}

// "Runs the service." as it stands behind a name: "runs the service".
std::string Summary(std::string description) {
    if (description.ends_with('.')) description.pop_back();
    if (!description.empty()) {
        description[0] = static_cast<char>(tolower(static_cast<unsigned char>(description[0])));
    }
    return description;
}

// Both are roff already.
void WriteEntry(std::string& page, const std::string& term, const std::string& text) {
    page += ".TP\n" + term + "\n" + text + "\n";
}

void WriteHead(std::string& page, const ManPage& data, const std::string& summary) {
    page += ".TH " + RoffText(Upper(data.name)) + " " + std::to_string(data.number) +
            " \"\" \"Ferrix\" \"Copy service\"\n";
    page += ".nh\n.ad l\n";  // words are copied into shells: none is broken or spread
    page += ".SH NAME\n" + RoffText(data.name) + " \\- " + RoffText(summary) + "\n";
}

void WriteSections(std::string& page, const ManPage& data) {
    for (const ManPage::Section& section : data.sections) {
        page += ".SH " + RoffText(section.title) + "\n";
        for (const ManPage::Entry& entry : section.entries) {
            WriteEntry(page, RoffBold(entry.term), RoffText(entry.text));
        }
    }
    if (data.see_also.empty()) return;
    page += ".SH SEE ALSO\n";
    std::vector<std::string> names;
    for (const std::string& name : data.see_also) {
        const size_t number = name.find('(');
        names.push_back(RoffBold(name.substr(0, number)) + RoffText(name.substr(number)));
    }
    page += Joined(names, ",\n") + "\n";
}

void WriteDescription(std::string& page, const ManPage& data) {
    page += ".SH DESCRIPTION\n";
    for (const std::string& text : data.description) WriteParagraph(page, text);
}

// "NAME,..." says so by itself.
std::string ManyDots(const OptionInfo& option) {
    return option.is_repeatable && !option.value_name.ends_with("...") ? "..." : "";
}

// "--type TYPE" as it stands in a synopsis; the blank does not break the line.
std::string Usage(const OptionInfo& option, bool is_required) {
    std::string usage = RoffBold(option.names.empty() ? "" : option.label);
    if (!usage.empty() && option.HasValue()) usage += "\\ ";
    usage += RoffItalic(option.value_name) + ManyDots(option);
    return is_required ? usage : "[" + usage + "]";
}

// The options and arguments in one form of the call, of which `head`, if any, is the first.
std::string FormUsage(const CommandInfo& command, const OptionInfo* head,
                      const std::vector<std::string>& other_heads) {
    std::string usage = RoffBold(command.path);
    if (head != nullptr) usage += " " + Usage(*head, true);
    const auto add = [&](const OptionInfo& option) {
        const bool belongs_elsewhere =
            Contains(other_heads, option.label) ||
            std::any_of(option.needs.begin(), option.needs.end(),
                        [&](const std::string& label) { return Contains(other_heads, label); });
        if (&option == head || belongs_elsewhere) return;
        const bool is_needed = head != nullptr && Contains(head->needs, option.label);
        usage += " " + Usage(option, option.is_required || is_needed);
    };
    const bool has_many = command.options.size() > SHOWN_OPTIONS;
    if (has_many) usage += " [" + RoffItalic("OPTION") + "]...";
    for (const OptionInfo& option : command.options) {
        if (has_many && !option.is_required) continue;
        if (Contains(option.names, "--help")) continue;  // that each has it is told once
        add(option);
    }
    for (const OptionInfo& argument : command.arguments) add(argument);
    if (!command.commands.empty()) usage += " " + RoffItalic("COMMAND");
    return usage + "\n";
}

void WriteSynopsis(std::string& page, const ManPage& data, const CommandInfo& program) {
    page += ".SH SYNOPSIS\n";
    if (data.forms.empty()) {
        page += FormUsage(program, nullptr, {});
        if (!program.commands.empty()) {
            page += ".br\n" + RoffBold(program.path) + " " + RoffItalic("COMMAND") + " " +
                    RoffBold("--help") + "\n";
        }
        return;
    }
    for (const OptionInfo& option : program.options) {
        if (!Contains(data.forms, option.label)) continue;
        std::vector<std::string> others = data.forms;
        others.erase(std::find(others.begin(), others.end(), option.label));
        page += FormUsage(program, &option, others) + ".br\n";
    }
    page += RoffBold(program.path) + " " + RoffBold("--help") + "\n";
}

std::string OptionTerm(const OptionInfo& option) {
    std::vector<std::string> names;
    for (const std::string& name : option.names) names.push_back(RoffBold(name));
    std::string term = Joined(names, ", ");
    if (!term.empty() && option.HasValue()) term += " ";
    return term + RoffItalic(option.value_name) + ManyDots(option);
}

// The description, and what the parser knows besides, in sentences.
std::string OptionText(const OptionInfo& option) {
    std::string text = option.description;
    const auto add = [&text](const char* words, const std::string& what) {
        if (what.empty()) return;
        if (!text.empty() && text.back() != '.') text += '.';
        text += (text.empty() ? "" : " ") + std::string(words) + what + ".";
    };
    add("One of ", Joined(option.values, ", "));
    add("Checked: ", Joined(option.rules, ", "));
    add("Without it: ", option.default_text);
    add("Needs ", Joined(option.needs, ", "));
    add("Not together with ", Joined(option.excludes, ", "));
    return RoffText(text);
}

void WriteOptions(std::string& page, const std::vector<OptionInfo>& options) {
    for (const OptionInfo& option : options) {
        WriteEntry(page, OptionTerm(option), OptionText(option));
    }
}

void WriteExamples(std::string& page, const CommandInfo& command) {
    for (const std::string& note : command.notes) WriteParagraph(page, note);
    if (command.examples.empty()) return;
    page += ".PP\nExample:\n.PP\n.RS 4\n.nf\n";
    for (const std::string& line : command.examples) page += RoffText(line) + "\n";
    page += ".fi\n.RE\n";
}

// What the program itself has too, as "--help", is told once.
std::vector<OptionInfo> OwnOptions(const CommandInfo& command, const CommandInfo& program) {
    std::vector<OptionInfo> own;
    for (const OptionInfo& option : command.options) {
        const bool is_told =
            std::any_of(program.options.begin(), program.options.end(),
                        [&option](const OptionInfo& told) { return told.names == option.names; });
        if (!is_told) own.push_back(option);
    }
    return own;
}

void WriteCommand(std::string& page, const CommandInfo& command, const CommandInfo& program) {
    page += ".SS " + RoffText(command.path) + "\n";
    const std::string usage = FormUsage(command, nullptr, {});
    if (usage != RoffBold(command.path) + "\n")
        page += ".PP\n" + usage;  // says more than the title
    WriteParagraph(page, command.description);
    WriteOptions(page, command.arguments);
    WriteOptions(page, OwnOptions(command, program));
    WriteExamples(page, command);
    for (const CommandInfo& below : command.commands) WriteCommand(page, below, program);
}

}  // namespace

std::string PageText(const ManPage& page) {
    std::string text;
    WriteHead(text, page, page.summary);
    text += ".SH SYNOPSIS\n" + RoffBold(page.name) + "\n";
    WriteDescription(text, page);
    WriteSections(text, page);
    return text;
}

std::string PageText(const ManPage& page, const CommandInfo& program) {
    std::string text;
    WriteHead(text, page, page.summary.empty() ? Summary(program.description) : page.summary);
    WriteSynopsis(text, page, program);
    WriteDescription(text, page);
    WriteExamples(text, program);
    text += ".SH OPTIONS\n";
    WriteOptions(text, program.options);
    WriteOptions(text, program.arguments);
    if (!program.commands.empty()) {
        text += ".SH COMMANDS\n";
        for (const CommandInfo& command : program.commands) WriteCommand(text, command, program);
    }
    WriteSections(text, page);
    return text;
}
