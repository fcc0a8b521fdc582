#pragma once

#include <cstdint>
#include <filesystem>
#include <functional>
#include <string>
#include <vector>

namespace maroset {
class nodeDB;
}

namespace maroset::gateway {

// The project's Tags table: which tags the service registers on which node, and what it calls
// them. One row per tag:
//
//     Tags (Node TEXT, Handle INTEGER, Address TEXT, Name TEXT)
//
// Name may be NULL; the tag is then called by its address. The library's own load
// (AddAllNodes) never reads the table; the service does, after the load. Every statement is
// prepared with its values bound: nothing read from a client or a command line becomes SQL.
class TagTable {
  public:
    struct Row {
        std::string node;
        int32_t handle = 0;
        std::string address;
        std::string name;  // the address when the table leaves it empty
    };

    // Handles are the library's Integer tag ids: 1 to 32767.
    static constexpr int32_t MaxHandle = 32767;

    // Every row in table order; none when the project has no Tags table.
    static std::vector<Row> Rows(const std::filesystem::path& project);
    // Adds a row, creating the table on first use. A handle already used on the node (the node
    // named in any letter case) fails with 457 and adds nothing.
    static void Add(const std::filesystem::path& project, const Row& row);
    // Removes the node's tag with that handle; false when there was none.
    static bool Remove(const std::filesystem::path& project, const std::string& node,
                       int32_t handle);

    // Registers each row on its node (AddTag) and answers the rows that were. A row naming a
    // node the project does not have, a handle out of range, a handle already registered on
    // that node, or one that AddTag refuses is told to badRow in one line and skipped; the
    // rest go on.
    static std::vector<Row> Register(nodeDB& db, const std::vector<Row>& rows,
                                     const std::function<void(const std::string&)>& badRow);
};

}  // namespace maroset::gateway
