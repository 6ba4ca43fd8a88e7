#include "client/command.h"

#include <iostream>

#include "client/exit-status.h"
#include "client/help-formatter.h"
#include "client/text.h"

namespace {

std::string Footer(const std::string& example) {
    std::string footer = "Example:\n";
    for (size_t begin = 0; begin < example.size();) {
        const size_t end = std::min(example.find('\n', begin), example.size());
        footer += "  " + example.substr(begin, end - begin) + "\n";
        begin = end + 1;
    }
    footer.pop_back();  // the library adds the last line end itself
    return footer;
}

// The command that was meant, as far as it was understood: "ferrixctl task add".
std::string CommandWords(const CLI::App& program) {
    std::string words = program.get_name();
    const CLI::App* command = &program;
    while (!command->get_subcommands().empty()) {
        command = command->get_subcommands().front();
        words += " " + command->get_name();
    }
    return words;
}

}  // namespace

CLI::App* AddCommand(CLI::App& parent, const std::string& name, const std::string& description,
                     const std::string& example) {
    CLI::App* command = parent.add_subcommand(name, description);
    command->footer(Footer(example));
    return command;
}

CLI::App* AddCommandGroup(CLI::App& parent, const std::string& name, const std::string& description,
                          const std::string& example) {
    CLI::App* group = AddCommand(parent, name, description, example);
    group->require_subcommand(1);
    return group;
}

void AddJsonOption(CLI::App& command, bool& as_json) {
    command.add_flag("--json", as_json, "Write JSON, for scripts");
}

int RunProgram(CLI::App& program, int argc, const char* const* argv) {
    UseHelpFormatter(program);
    try {
        program.parse(argc, argv);
        std::cout.flush();
        return std::cout ? EXIT_DONE : EXIT_REFUSED;
    } catch (const CLI::Success& help) {
        return program.exit(help);
    } catch (const CLI::ParseError& error) {
        std::cerr << program.get_name() << ": " << Printable(error.what()) << "\n\""
                  << CommandWords(program) << " --help\" tells more\n";
        return EXIT_USAGE;
    } catch (const CommandError& error) {
        std::cout.flush();
        std::cerr << program.get_name() << ": " << error.what() << '\n';
        return error.Status();
    }
}
