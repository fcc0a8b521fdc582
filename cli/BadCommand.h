#pragma once

#include <stdexcept>
#include <string>

namespace maroset::cli {

// A command line of `maroset run` that cannot be carried out as written (unknown command,
// missing or malformed argument). It is answered like the library's Invalid procedure call or
// argument (5); the detail is shown in readable output only.
class BadCommand : public std::runtime_error {
  public:
    explicit BadCommand(const std::string& detail) : std::runtime_error(detail) {}
};

}  // namespace maroset::cli
