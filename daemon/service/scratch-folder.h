// The folder "@tmp" of a volume: what a repository passes through on its way to another volume, and
// what is kept there of former ones.
//
// Threads: one control program at a time.
#pragma once

#include <string>

class ScratchFolder {
public:
    explicit ScratchFolder(const std::string& volume);

    // Where a copy grows, and where a repository goes that is to be removed. Nothing in the
    // background ever works under this name.
    [[nodiscard]] const std::string& Place() const { return m_place; }
    // Makes the folder, for its owner alone, and empties the place: the programs would put what
    // they move into a folder that they find there. False when something is left.
    [[nodiscard]] bool ClearPlace() const;

    // Puts away what lies under `path`, which may be nothing, under a name that is free. False when
    // it is still there.
    [[nodiscard]] bool Keep(const std::string& path) const;
    // Removes it in the background, as what earlier removals have left; a failure is logged.
    void Remove(const std::string& path) const;
    void RemoveLeftovers() const;

private:
    [[nodiscard]] bool Make() const;
    [[nodiscard]] std::string Numbered(const char* name, int number) const;
    [[nodiscard]] std::string FreeName(const char* name) const;

    std::string m_path;
    std::string m_place;
};
