#pragma once

#include <filesystem>
#include <string>

namespace maroset::test {

// Runs an SQL script (several statements) against an SQLite file, creating it if needed, so
// tests can lay out project databases exactly as they want them. Throws on any SQL error.
void RunSqlScript(const std::filesystem::path& file, const std::string& script);

}  // namespace maroset::test
