#include "facts/owner_names.hpp"

#include "facts/run_facts.hpp"
#include "facts/tallies.hpp"
#include "vorn/user.h"
#include "vornreport/handles.hpp"

namespace vornreport {
namespace {

void note_owner(const VLIBCSzHash* users, uid_t uid) {
  RunFacts& facts = run_facts();
  VORNUser* user = nullptr;
  const bool is_known = VORNUserGetByUID(uid, &user) >= 0;
  const UserHandle owned(user);
  if (is_known && user != nullptr && !is_unset(user->name) && facts.may_tell(user->name) &&
      VLIBCSzHashGetValue(users, user->name) != nullptr) {
    (*facts.owners)[uid] = user->name;
  }
}

}  // namespace

void note_owner_names(const VLIBCSzHash* users) {
  if (run_facts().owners) {
    return;
  }
  run_facts().owners.emplace();
  for (const ShareTally& share : tallies().shares()) {
    for (const VolumeTally& volume : share.volumes()) {
      for (const auto& [uid, amount] : volume.owners) {
        note_owner(users, uid);
      }
    }
  }
}

}  // namespace vornreport
