#include "base/scratch.hpp"

namespace host {
namespace {

std::string& folder_of_the_run() {
  static std::string folder;
  return folder;
}

}  // namespace

const std::string& scratch_folder() {
  return folder_of_the_run();
}

void set_scratch_folder(const std::string& folder) {
  folder_of_the_run() = folder;
}

}  // namespace host
