#include <poll.h>
#include <signal.h>
#include <unistd.h>

#include <charconv>
#include <iostream>
#include <optional>

#include "client/command.h"
#include "client/ctl.h"
#include "client/exit-status.h"
#include "client/json-output.h"
#include "client/log-file.h"
#include "client/log-kind.h"
#include "client/log-output.h"
#include "client/log-query.h"
#include "client/log-reader.h"
#include "client/log-tail.h"
#include "client/when.h"

namespace {

struct LogOptions {
    std::optional<std::string> task;
    std::optional<std::string> since;
    std::optional<std::string> until;
    std::string type;
    std::string text;
    uint32_t limit = 100;
    bool is_followed = false;
    bool as_json = false;
};

using Rows = std::vector<LogInfo>;

volatile sig_atomic_t is_interrupted = 0;

// Once: a second interrupt ends the program, whatever it does.
void EndOnInterrupt() {
    struct sigaction action {};
    action.sa_handler = [](int) { is_interrupted = 1; };
    action.sa_flags = SA_RESETHAND;
    sigaction(SIGINT, &action, nullptr);
}

uint64_t TaskByName(const Ctl& ctl, const std::string& name) {
    try {
        return ctl.daemon.FindTask(name)["id"].AsUInt64();
    } catch (const CommandError& error) {
        throw CommandError(error.Status(),
                           std::string(error.what()) +
                               ". A task's id always works here, also "
                               "that of a task that was removed, and --grep finds names");
    }
}

// Digits are an id, whether there is such a task or not: a removed task has rows as well.
uint64_t TaskId(const Ctl& ctl, const std::string& text) {
    if (text.find_first_not_of("0123456789") != std::string::npos) return TaskByName(ctl, text);
    uint64_t id = 0;
    const char* end = text.data() + text.size();
    if (std::from_chars(text.data(), end, id).ec != std::errc() || id == 0) {
        throw CommandError(EXIT_USAGE, "\"" + text + "\" is no task's id");
    }
    return id;
}

LogQuery MakeQuery(const LogOptions& options, const Ctl& ctl) {
    LogQuery::Wish wish;
    const time_t now = time(nullptr);
    if (options.since) wish.from_time = ParseWhen(*options.since, WhenEdge::BEGIN, now);
    if (options.until) wish.to_time = ParseWhen(*options.until, WhenEdge::END, now);
    if (wish.to_time != 0 && wish.from_time > wish.to_time) {
        throw CommandError(EXIT_USAGE, "--since is later than --until");
    }
    wish.log_type = LogTypeOf(options.type);
    wish.text = options.text;
    if (options.task) wish.task_id = TaskId(ctl, *options.task);
    return LogQuery(wish);
}

void ShowLog(const LogOptions& options, const LogQuery& query, const Ctl& ctl) {
    LogFile file;
    const Rows rows = ReadLog(file.Db(), query, options.limit);
    if (options.as_json) {
        Json::Value list(Json::arrayValue);
        for (const LogInfo& row : rows) list.append(LogJson(row));
        return PrintJson(list);
    }
    for (const LogInfo& row : rows) std::cout << LogLine(row, ctl.output);
    if (rows.empty()) std::cout << "The log has no such entry.\n";
}

void ShowFollowed(const Rows& rows, const LogOptions& options, const Ctl& ctl) {
    for (const LogInfo& row : rows) {
        std::cout << (options.as_json ? JsonLine(LogJson(row)) + '\n' : LogLine(row, ctl.output))
                  << std::flush;
    }
}

// False when there is no use in going on: interrupted, or nobody reads the output any more.
bool WaitForNextLook() {
    constexpr int INTERVAL_MS = 1000;
    if (is_interrupted != 0 || !std::cout) return false;
    pollfd output{STDOUT_FILENO, 0, 0};
    const bool is_gone = poll(&output, 1, INTERVAL_MS) > 0;
    return !is_gone && is_interrupted == 0;
}

void FollowLog(const LogOptions& options, const LogQuery& query, const Ctl& ctl) {
    LogFile file;
    EndOnInterrupt();
    // What is shown first and what is new from then on come from one look.
    const NewestRows newest = ReadNewest(file.Db(), LogQuery::Everything(), [&](const Rows& rows) {
        return LogTail::LongEnough(rows) && HoldEnough(rows, query, options.limit);
    });
    LogTail tail;
    tail.Begin(newest);
    ShowFollowed(FittingRows(newest.rows, query, options.limit), options, ctl);
    while (WaitForNextLook()) {
        if (!file.HasNews()) continue;
        ShowFollowed(FittingRows(tail.NewRows(file.Db()), query, 0), options, ctl);
    }
}

}  // namespace

void AddLogCommand(CLI::App& program, const Ctl& ctl) {
    const auto options = std::make_shared<LogOptions>();
    CLI::App* command = AddCommand(
        program, "log",
        "Tells what the service has done: tasks added, run and failed, files that could not be "
        "copied. The newest entry comes last. A time is written as 2026-11-21, \"2026-11-21 "
        "12:30\", 2026-11-21T12:30:05, today, yesterday, 12:30, or as 30min, 2h, 3d, 2w ago.",
        "ferrixctl log --since yesterday --type file\n"
        "ferrixctl log --task Camera --limit 10\n"
        "ferrixctl log --grep IMG_1.JPG --limit 0 --json\n"
        "ferrixctl log --follow");
    command
        ->add_option("--task", options->task,
                     "Only of this task: its id, or its name while the daemon runs; digits "
                     "are an id")
        ->type_name("TASK");
    command->add_option("--since", options->since, "Only from this time on");
    CLI::Option* until = command->add_option(
        "--until", options->until, "Only up to this time; a day or a minute counts to its end");
    command
        ->add_option("--type", options->type,
                     "Only of this kind: \"info\", \"task\" (runs that failed or were stopped), "
                     "\"file\" (files that failed)")
        ->check(CLI::IsMember(LogKindNames()));
    command->add_option("--grep", options->text,
                        "Only with this text in the name of a task or a file; upper and lower "
                        "case are the same");
    command->add_option("--limit", options->limit, "The newest so many entries; 0 for all")
        ->capture_default_str();
    CLI::Option* follow = command->add_flag(
        "--follow", options->is_followed,
        "Then wait for new entries and show them, until interrupted; with --json, one object a "
        "line");
    until->excludes(follow);
    AddJsonOption(*command, options->as_json);
    command->callback([options, &ctl] {
        const LogQuery query = MakeQuery(*options, ctl);
        options->is_followed ? FollowLog(*options, query, ctl) : ShowLog(*options, query, ctl);
    });
}
