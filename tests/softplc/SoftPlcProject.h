#pragma once

#include <filesystem>
#include <string>

#include "support/SqlScript.h"

namespace maroset::test {

// A project database holding NUVTCPIP nodes: one row per (name, host, port).
inline std::string SoftPlcProject(const std::filesystem::path& file, const std::string& rows) {
    RunSqlScript(file,
                 "create table Nodes (Name text, Driver text, OPCServer text, OPCTopic text, "
                 "UpdateRate integer, CommPort integer, BaudRate integer, TagPrefex text, "
                 "IPAddress text, Port integer);"
                 "insert into Nodes (Name, Driver, UpdateRate, IPAddress, Port) values " +
                     rows + ";");
    return file.string();
}

}  // namespace maroset::test
