#include "client/log-kind.h"

#include <algorithm>
#include <iterator>

#include "db/log-db.h"

namespace {

struct KindRow {
    int log_type;
    const char* name;
    Colour colour;
};

constexpr KindRow KINDS[] = {
    {LogDB::LOG_TYPE_INFO,       "info", Colour::PLAIN },
    {LogDB::LOG_TYPE_TASK_ERROR, "task", Colour::RED   },
    {LogDB::LOG_TYPE_FILE_ERROR, "file", Colour::YELLOW},
};

const KindRow* FindKind(int log_type) {
    const auto* row = std::ranges::find(KINDS, log_type, &KindRow::log_type);
    return row == std::end(KINDS) ? nullptr : row;
}

}  // namespace

const std::vector<std::string>& LogKindNames() {
    static const std::vector<std::string> names = [] {
        std::vector<std::string> all;
        for (const KindRow& row : KINDS) all.emplace_back(row.name);
        return all;
    }();
    return names;
}

std::string LogKindName(int log_type) {
    const KindRow* row = FindKind(log_type);
    return row != nullptr ? row->name : std::to_string(log_type);
}

int LogTypeOf(const std::string& name) {
    for (const KindRow& row : KINDS) {
        if (name == row.name) return row.log_type;
    }
    return 0;
}

Colour LogKindColour(int log_type) {
    const KindRow* row = FindKind(log_type);
    return row != nullptr ? row->colour : Colour::PLAIN;
}
