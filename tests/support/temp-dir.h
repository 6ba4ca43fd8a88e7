// A scratch folder below $TMPDIR or /tmp, removed with all it holds by the destructor.
#pragma once

#include <string>

class TempDir {
public:
    TempDir();
    ~TempDir();
    TempDir(const TempDir&) = delete;
    TempDir& operator=(const TempDir&) = delete;

    [[nodiscard]] const std::string& Path() const { return m_path; }
    // Path() + "/" + name.
    [[nodiscard]] std::string operator/(const std::string& name) const;
    // Writes a file below the folder, making its parents; returns its full path.
    std::string Write(const std::string& name, const std::string& content) const;
    // Makes a folder below, with parents; returns its full path.
    std::string MakeDir(const std::string& name) const;

private:
    std::string m_path;
};

// The whole content of a file; fails the running test when it cannot be read.
std::string ReadWholeFile(const std::string& path);
