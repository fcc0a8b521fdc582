#pragma once

#include <stdexcept>
#include <string>

namespace maroset::cli {

// A command line the command cannot use: the message is shown with the subcommand's usage
// and the command exits with status 2.
class UsageError : public std::runtime_error {
  public:
    explicit UsageError(const std::string& message) : std::runtime_error(message) {}
};

}  // namespace maroset::cli
