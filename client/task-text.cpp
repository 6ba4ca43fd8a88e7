#include "client/task-text.h"

#include "client/text.h"
#include "db/task-info.h"
#include "ipc/pobject.h"

namespace {

bool IsExport(const PObject& task) { return task["type"].AsInt32() == TASK_TYPE_EXPORT_GENERAL; }

std::string OnDevice(const PObject& task, const char* key) {
    const std::string share = task["usb_share_name"].AsString();
    return Printable((share.empty() ? "device" : share) + ":" + task[key].AsString());
}

std::string InShare(const PObject& task, const char* key) {
    return Printable(task[key].StringView());
}

}  // namespace

std::string TaskLabel(const PObject& task) {
    return std::to_string(task["id"].AsUInt64()) + " " + Printable(task["task_name"].StringView());
}

Table::Cell StatusCell(const PObject& task) {
    const std::string status = Printable(task["task_status"].StringView());
    if (status == "successful") return {status, Colour::GREEN};
    if (status == "failed") return {status, Colour::RED};
    if (status == "copying") return {status, Colour::CYAN};
    if (status == "waiting" || status == "canceling") return {status, Colour::YELLOW};
    if (status == "unmounted" || status == "disabled") return {status, Colour::GREY};
    return {status};
}

std::string SourceText(const PObject& task) {
    return IsExport(task) ? InShare(task, "source_path") : OnDevice(task, "source_path");
}

std::string DestinationText(const PObject& task) {
    return IsExport(task) ? OnDevice(task, "destination_path") : InShare(task, "destination_path");
}

std::string DeviceText(const PObject& task) {
    const std::string producer = task["producer"].AsString();
    const std::string product = task["product"].AsString();
    const char* between = producer.empty() || product.empty() ? "" : " ";
    return Printable(producer + between + product);
}

std::string StrategyText(int strategy) {
    switch (strategy) {
        case COPY_STRATEGY_VERSION:
            return "version";
        case COPY_STRATEGY_MIRROR:
            return "mirror";
        case COPY_STRATEGY_INCREMENTAL:
            return "incremental";
        default:
            return std::to_string(strategy);
    }
}

std::string TaskTypeText(int type) {
    switch (type) {
        case TASK_TYPE_IMPORT_GENERAL:
            return "import";
        case TASK_TYPE_IMPORT_PHOTO:
            return "photo import";
        case TASK_TYPE_EXPORT_GENERAL:
            return "export";
        default:
            return std::to_string(type);
    }
}

std::string ConflictPolicyText(int policy) {
    return policy == CONFLICT_POLICY_RENAME ? "rename" : "overwrite";
}

std::string RotationPolicyText(int policy) {
    switch (policy) {
        case ROTATION_POLICY_OLDEST:
            return "oldest first";
        case ROTATION_POLICY_CONDITIONAL:
            return "smart";
        default:
            return std::to_string(policy);
    }
}
