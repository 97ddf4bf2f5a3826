#pragma once

#include <string>

namespace service {

class Database;

// The manifest's one row in the state database, as UTF-8 text.
void writeManifest(Database& state, const std::string& text);
std::string readManifest(Database& state);

} // namespace service
