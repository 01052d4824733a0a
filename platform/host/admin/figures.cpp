#include "vorn/admin/figures.hpp"

#include "run/report_figures.hpp"

namespace admin {
namespace {

Outlook outlook_of(host::Outlook outlook) {
  switch (outlook) {
    case host::Outlook::no_growth:
      return Outlook::no_growth;
    case host::Outlook::soon:
      return Outlook::soon;
    case host::Outlook::days:
      return Outlook::days;
    case host::Outlook::unknown:
      break;
  }
  return Outlook::unknown;
}

}  // namespace

std::optional<FullestVolume> fullest_volume(const std::string& page) {
  const auto volume = host::read_figures(page.c_str()).volume;
  if (!volume) {
    return std::nullopt;
  }
  return FullestVolume{volume->name, volume->percent, outlook_of(volume->outlook), volume->days};
}

}  // namespace admin
