// The creation of a folder of an incremental task: recorded always, made only when the folders of
// the source are kept.
#pragma once

#include "strategy/create-handler.h"

class IncBackupCreateHandler final : public CreateHandler {
protected:
    [[nodiscard]] int RunCreate() override;
    [[nodiscard]] int SetCreateFullPath() override;

private:
    [[nodiscard]] int UpdateDB();
};
