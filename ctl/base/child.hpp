// A program that runs while its output is read.
#ifndef VORN_CTL_CHILD_HPP
#define VORN_CTL_CHILD_HPP

#include <sys/types.h>

#include <chrono>
#include <string>
#include <vector>

#include "vorn/base/file_io.hpp"

namespace ctl {

class Child {
 public:
  // Starts `arguments` (the first is the program's path) in a process group of its own, so that
  // Ctrl-C reaches this process only, with its output and errors going to one place. That place is
  // a terminal where there can be one, since programs write line by line to those only. Throws a
  // Failure when it can't be started.
  explicit Child(const std::vector<std::string>& arguments);
  Child(const Child&) = delete;
  Child& operator=(const Child&) = delete;
  ~Child();

  pid_t pid() const { return pid_; }
  // What it prints within `wait`; empty when that is nothing.
  std::string read_output(std::chrono::milliseconds wait);
  // Whether it has ended; then exit_status() holds.
  bool has_ended();
  // As a shell gives it: 128 and the signal for a killed one.
  int exit_status() const { return exit_status_; }
  void send_signal(int signal) const;

 private:
  pid_t pid_ = 0;
  bool ended_ = false;
  int exit_status_ = 0;
  host::Fd output_;
};

}  // namespace ctl

#endif
