#pragma once

#include <string>
#include <vector>

namespace maroset::cli {

// `maroset project init|add|list|tag`: make and look at a project database (ProjectDatabase,
// and the service's TagTable) without any other tool.
class ProjectCommands {
  public:
    static const char* const Usage;
    static const char* const InitUsage;
    static const char* const AddUsage;
    static const char* const ListUsage;
    static const char* const TagUsage;

    // `maroset project ARGS...`; returns the exit status: 0 done, 1 the database refused
    // (message on standard error), 2 usage error.
    static int Main(const std::vector<std::string>& args);

  private:
    static int Init(const std::vector<std::string>& args);
    static int Add(const std::vector<std::string>& args);
    static int List(const std::vector<std::string>& args);
    static int Tag(const std::vector<std::string>& args);
};

}  // namespace maroset::cli
