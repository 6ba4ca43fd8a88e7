// One step that lifts a repository from one version to the next.
#pragma once

#include <string>
#include <utility>

class UpdaterBase {
public:
    // `repository` is the repository's folder, the volume followed by "/@Ferrix".
    explicit UpdaterBase(std::string repository) : m_repository(std::move(repository)) {}
    virtual ~UpdaterBase() = default;
    UpdaterBase(const UpdaterBase&) = delete;
    UpdaterBase& operator=(const UpdaterBase&) = delete;

    // 0, or -1 (logged): each file is then in its old form or in its new one, and Run() of a later
    // start goes on from there.
    [[nodiscard]] virtual int Run() = 0;

protected:
    std::string m_repository;
};
