#include "host/share-admin.h"

#include <unistd.h>

#include <cerrno>
#include <utility>

#include "host/share-folder.h"
#include "host/share-rules.h"
#include "host/text.h"

namespace keld_host {
namespace {

ShareOutcome Done(const std::string& path) { return {ShareOutcome::DONE, path}; }

ShareOutcome Failed(const std::string& path, const char* what, int error) {
    return {ShareOutcome::REFUSED, path + " cannot be " + what + ": " + Because(error)};
}

// Opens the box and makes the plan; `arguments` are those of `make` between the two.
template <typename Make, typename... Arguments>
ShareOutcome Plan(ShareBox& box, bool forChange, SharePlan& plan, Make make,
                  const Arguments&... arguments) {
    const ShareOutcome outcome = box.Open(forChange);
    return outcome.IsDone() ? make(box, arguments..., plan) : outcome;
}

template <typename Make, typename... Arguments>
ShareOutcome Check(Make make, const Arguments&... arguments) {
    ShareBox box;
    SharePlan plan;
    const ShareOutcome outcome = Plan(box, false, plan, make, arguments...);
    return outcome.IsDone() ? Done(plan.path) : outcome;
}

// The second step of a rename has failed: back to the first.
ShareOutcome TakeBack(const SharePlan& plan, const ShareOutcome& failure) {
    const int error = RenameShareFolder(plan.newPath, plan.path);
    if (error == 0) return failure;
    return {ShareOutcome::REFUSED, failure.text + "; the folder is " + plan.newPath +
                                       " now and cannot be called back (" + Because(error) +
                                       "): rename it to " + plan.path + " by hand"};
}

}  // namespace

ShareOutcome CheckShareConf() {
    ShareBox box;
    return box.Open(false);
}

ShareOutcome AddShare(const std::string& nameOrPath) {
    ShareBox box;
    SharePlan plan;
    const ShareOutcome outcome = Plan(box, true, plan, PlanAdd, nameOrPath);
    if (!outcome.IsDone()) return outcome;
    bool wasMade = false;
    int error = MakeShareFolder(plan.path, wasMade);
    if (error == ENOTDIR) {
        return {ShareOutcome::REFUSED, plan.path +
                                           " is no folder but a link or a file: take "
                                           "another name, or move it away"};
    }
    if (error != 0) return Failed(plan.path, "made", error);
    if (!plan.text) return Done(plan.path);
    error = box.File().Replace(*plan.text);
    if (error == 0) return Done(plan.path);
    if (wasMade) static_cast<void>(RemoveShareFolder(plan.path));
    return Failed(box.File().Path(), "changed", error);
}

ShareOutcome CheckRemoveShare(const std::string& name) { return Check(PlanRemoval, name); }

ShareOutcome RemoveShare(const std::string& name) {
    ShareBox box;
    SharePlan plan;
    const ShareOutcome outcome = Plan(box, true, plan, PlanRemoval, name);
    if (!outcome.IsDone()) return outcome;
    if (plan.text) {
        const int error = box.File().Replace(*plan.text);
        return error == 0 ? Done(plan.path) : Failed(box.File().Path(), "changed", error);
    }
    const int error = RemoveShareFolder(plan.path);
    if (error == 0) return Done(plan.path);
    if (access(plan.path.c_str(), F_OK) == 0) return Failed(plan.path, "removed", error);
    return {ShareOutcome::REFUSED,
            plan.path + " is removed, but the disk has not confirmed it: " + Because(error)};
}

ShareOutcome CheckRenameShare(const std::string& name, const std::string& newName) {
    return Check(PlanRename, name, newName);
}

ShareOutcome RenameShare(const std::string& name, const std::string& newName) {
    ShareBox box;
    SharePlan plan;
    const ShareOutcome outcome = Plan(box, true, plan, PlanRename, name, newName);
    if (!outcome.IsDone()) return outcome;
    int error = RenameShareFolder(plan.path, plan.newPath);
    if (error != 0) return Failed(plan.path, "renamed", error);
    error = plan.text ? box.File().Replace(*plan.text) : 0;
    if (error == 0) return Done(plan.newPath);
    return TakeBack(plan, Failed(box.File().Path(), "changed", error));
}

}  // namespace keld_host
