#pragma once

#include <array>
#include <filesystem>
#include <string>
#include <utility>
#include <vector>

#include "lang/Variant.h"

namespace maroset::cli {

// A project database as the library loads it: an SQLite file with a Nodes table of the
// columns below, one row per node. Columns a row does not set stay NULL, and reach the node
// as Null, as they would from any other project.
class ProjectDatabase {
  public:
    static constexpr std::array<const char*, 10> Columns = {
        "Name",     "Driver",   "OPCServer", "OPCTopic",  "UpdateRate",
        "CommPort", "BaudRate", "TagPrefex", "IPAddress", "Port"};

    using Field = std::pair<std::string, Variant>;  // column, value

    // A new file with an empty Nodes table; fails with 3204 when the file exists.
    static void Create(const std::filesystem::path& file);
    // Adds one node. A name already in the table (in any letter case, as the node collection
    // compares them) fails with 457 and adds nothing.
    static void AddNode(const std::filesystem::path& file, const std::vector<Field>& fields);
    // Every row, its values in the order of Columns.
    static std::vector<std::vector<Variant>> Rows(const std::filesystem::path& file);
};

}  // namespace maroset::cli
