#include "vorn/admin/messages.hpp"

#include <utility>

#include "base/host_log.hpp"

namespace admin {
namespace {

std::vector<std::string>& kept() {
  static std::vector<std::string> messages;
  return messages;
}

}  // namespace

std::vector<std::string> take_messages() {
  host::redirect_log([](const char* line) { kept().emplace_back(line); });
  return std::exchange(kept(), {});
}

}  // namespace admin
