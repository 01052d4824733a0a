// What testparm and net print, and the files of users' shares.
#include "config/samba_text.hpp"
#include "fuzz.hpp"

namespace {

void check(const ctl::SambaShare& share) {
  fuzz::require(
      share.name.find('\n') == share.name.npos && share.path.find('\n') == share.path.npos,
      "names and paths stand in a line");
  fuzz::require(!share.skipped.empty() || share.path.find('%') == share.path.npos,
                "a path with variables is none");
}

}  // namespace

void fuzz::one(std::string_view text) {
  ctl::Parameters defaults;
  for (const ctl::Service& service : ctl::parse_services(text)) {
    check(ctl::judged(service, defaults));
    if (ctl::lower(service.name) == "global") {
      defaults = service.parameters;
    }
  }
  check(ctl::judged(ctl::user_share_in(text, "file"), {}));
}
