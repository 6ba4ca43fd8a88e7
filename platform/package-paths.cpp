#include "platform/package-paths.h"

namespace {

// Never destroyed: threads may still ask while the process exits.
std::string& Folder() {
    static std::string& folder = *new std::string(PACKAGE_FOLDER);
    return folder;
}

}  // namespace

std::string SettingPath() { return PackagePath("/etc/setting.conf"); }

std::string StatusPath() { return PackagePath("/etc/status"); }

std::string StatusLockPath() { return PackagePath("/etc/status.lock"); }

std::string SystemFilterPath() { return PackagePath("/target/etc/ferrix_system.filter"); }

std::string NotifierPath() { return PackagePath("/target/bin/ferrix-notifier"); }

std::string PackagePath(const char* relative) { return Folder() + relative; }

void SetPackageFolderForTest(const std::string& folder) {
    Folder() = folder.empty() ? PACKAGE_FOLDER : folder;
}
