#include "config/password_file.hpp"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>

#include "vorn/base/file_io.hpp"

namespace host {

std::string password_problem(const std::string& path, std::string& password) {
  constexpr std::size_t kLargest = 4096;
  if (!path.starts_with('/')) {
    return "is not absolute; write its path from / on";
  }
  const Fd file(open(path.c_str(), O_RDONLY | O_NONBLOCK | O_NOCTTY | O_CLOEXEC));
  struct stat status {};
  if (!file || fstat(file.get(), &status) != 0 || !S_ISREG(status.st_mode)) {
    return std::string("can't be read (") + (file ? "no regular file" : std::strerror(errno)) +
           "); make it a regular file with the password as its first line";
  }
  if ((status.st_mode & (S_IRWXO | S_IWGRP)) != 0 ||
      (status.st_uid != 0 && status.st_uid != geteuid())) {
    return "can be read or changed by others; run chown root and chmod 600 on it";
  }
  password = read_start(file.get(), kLargest).value_or("");
  password.resize(std::min(password.find_first_of("\r\n"), password.size()));
  return password.empty() ? "holds no password in its first line" : "";
}

}  // namespace host
