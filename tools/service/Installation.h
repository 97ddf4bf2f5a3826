#pragma once

#include <string>

namespace service {

// The folders and files of the service, and of what it shares with the shell extension.
struct Installation {
    std::wstring folder;

    std::wstring configFolder() const;
    std::wstring dataFolder() const;
    std::wstring configDatabase() const;
    std::wstring stateDatabase() const;
    std::wstring historyDatabase() const;
    // The file with the bytes of a version.
    std::wstring contentFile(const std::wstring& content) const;
};

// Creates folders, databases and registry values; keeps what an earlier installation in the same folder has stored.
void install(const std::wstring& folder);

// Throws a Failure when the service is not installed.
Installation findInstallation();

// Tells the shell extension that the stored manifest has changed.
void announceManifest();

} // namespace service
