#pragma once

#include <string>
#include <vector>

namespace maroset::cli {

// `maroset project init|add|list`: make and look at a project database (ProjectDatabase)
// without any other tool.
class ProjectCommands {
  public:
    static const char* const Usage;
    static const char* const InitUsage;
    static const char* const AddUsage;
    static const char* const ListUsage;

    // `maroset project ARGS...`; returns the exit status: 0 done, 1 the database refused
    // (message on standard error), 2 usage error.
    static int Main(const std::vector<std::string>& args);

  private:
    static int Init(const std::vector<std::string>& args);
    static int Add(const std::vector<std::string>& args);
    static int List(const std::vector<std::string>& args);
};

}  // namespace maroset::cli
