#pragma once

#include <string>

namespace service {

// Where the service keeps what is its own and what it shares with the shell extension.
struct Installation {
    std::wstring folder;

    std::wstring configFolder() const;
    std::wstring dataFolder() const;
    std::wstring storeFolder() const;
    std::wstring configDatabase() const;
    std::wstring stateDatabase() const;
    std::wstring historyDatabase() const;
};

// Makes folders, databases and registry keys; keeps what an earlier installation in the same folder has stored.
Installation install(const std::wstring& folder);
// Throws when the service is not installed.
Installation findInstallation();

// Tells the readers of the stored manifest that it has changed.
void announceManifest();

} // namespace service
