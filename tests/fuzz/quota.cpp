// What the quota tool prints.
#include <memory>

#include "base/text_containers.hpp"
#include "fuzz.hpp"
#include "rep_quota_usage.hpp"

using namespace vornreport;

namespace {

bool is_wanted(std::string_view name) {
  return name.starts_with('u') || name.starts_with('\xc3');
}

void check(const QuotaVolume& volume) {
  fuzz::require(volume.users.size() == std::min<uint64_t>(volume.filteredUsers, kMostQuotaUsers),
                "users are shown up to the limit");
  for (const auto& [used, user] : volume.users) {
    fuzz::require(is_wanted(user.name) && user.name.size() <= 127, "only users of the filter");
    fuzz::require(user.name.find_first_of(" \n") == std::string::npos, "a name is a word");
    fuzz::require(used == user.used, "users stand at their usage");
  }
}

}  // namespace

void fuzz::one(std::string_view text) {
  VLIBCSzHash users(8);
  users.resolve_with([](std::string_view name) {
    return is_wanted(name) ? std::optional<std::string>("1") : std::nullopt;
  });
  FILE* output = fmemopen(const_cast<char*>(text.data()), text.size(), "r");
  if (output == nullptr) {
    return;  // an empty one
  }
  QAZLLNode* volumes = nullptr;
  QuotaUsageParse(output, &volumes, "/volume", 1000, &users);
  std::fclose(output);
  require(volumes != nullptr && volumes->next == nullptr, "an output is a volume");
  check(*quota_volume_of(volumes));
  QAZLLfree(&volumes, QuotaFreeVolume);
}
