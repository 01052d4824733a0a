// Programs of the system that vornctl asks.
#ifndef VORN_CTL_ASK_PROGRAM_HPP
#define VORN_CTL_ASK_PROGRAM_HPP

#include <chrono>
#include <optional>
#include <string>
#include <vector>

namespace ctl {

struct Answer {
  int status = 0;  // exit status, or 128 and the signal's number
  std::string out;
  std::string error;
};

// Runs the program `arguments[0]` of PATH, in the C locale and without input, and waits for its
// end. Nothing when there is no such program. Throws a Failure when it can't be run, takes longer
// than `limit`, or prints more than 64 MiB; it is ended then.
std::optional<Answer> ask_program(const std::vector<std::string>& arguments,
                                  std::chrono::seconds limit = std::chrono::seconds(60));

}  // namespace ctl

#endif
