// A version task in place of the mirror task of StrategyFixture, with an open log database.
#pragma once

#include "strategy-fixture.h"
#include "strategy/version-mark.h"

class VersionFixture : public StrategyFixture {
protected:
    VersionFixture();
    ~VersionFixture() override;

    // Gives the run another folder, as the task worker does at the start of a run.
    void SetVersionDir(const std::string& name);
    // A version that stands at the destination already, with one file in it.
    std::string MakeVersion(const std::string& name) const;
    // The names at the destination, sorted.
    [[nodiscard]] std::vector<std::string> Versions() const;
    [[nodiscard]] std::string MarksPath() const;
    [[nodiscard]] static std::vector<VersionMark> Marks();
    // The parameters of the log rows of removed versions, in their order.
    [[nodiscard]] static std::vector<std::string> RotatedRows();

    static constexpr char RUN_DIR[] = "Ferrix Copy_2024-03-09_141502";
};

// Sets TZ for as long as it lives.
class TimeZone {
public:
    explicit TimeZone(const char* zone);
    ~TimeZone();
    TimeZone(const TimeZone&) = delete;
    TimeZone& operator=(const TimeZone&) = delete;
};
