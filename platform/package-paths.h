// Where the files of the installed package are.
//
// The package's folder is fixed, "/var/packages/Ferrix". Unit tests put a scratch folder in its
// place before they start threads; nothing else does.
#pragma once

#include <string>

inline constexpr char PACKAGE_FOLDER[] = "/var/packages/Ferrix";

// Global settings: the repository's volume, the beep.
[[nodiscard]] std::string SettingPath();  // etc/setting.conf
// State of the service, and the file that is locked while it is read or written.
[[nodiscard]] std::string StatusPath();      // etc/status
[[nodiscard]] std::string StatusLockPath();  // etc/status.lock
// Names that no task copies.
[[nodiscard]] std::string SystemFilterPath();  // target/etc/ferrix_system.filter
// The program that the platform's scheduler runs for a task.
[[nodiscard]] std::string NotifierPath();  // target/bin/ferrix-notifier
// The package's folder followed by `relative`, which starts with "/".
[[nodiscard]] std::string PackagePath(const char* relative);

// An empty folder gives the fixed one back.
void SetPackageFolderForTest(const std::string& folder);
