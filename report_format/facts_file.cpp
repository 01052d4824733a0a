#include "report_format/facts_file.hpp"

#include <fcntl.h>

#include "report_format/reports.hpp"
#include "vorn/base/file_io.hpp"

namespace report_format {

std::optional<Facts> read_facts(const std::string& report_folder) {
  const host::ErrnoKeeper keeper;
  const host::Fd file = host::open_regular(AT_FDCWD, (report_folder + "/" + kFactsFile).c_str());
  const auto text = file ? host::read_start(file.get(), kLargestFacts + 1) : std::nullopt;
  return text && text->size() <= kLargestFacts ? facts_of(*text) : std::nullopt;
}

std::optional<std::int64_t> read_started(int report_folder) {
  // Before it stand a few short texts.
  constexpr std::size_t kBeginning = std::size_t{64} << 10U;
  const host::ErrnoKeeper keeper;
  const host::Fd file = host::open_regular(report_folder, kFactsFile);
  const auto text = file ? host::read_start(file.get(), kBeginning) : std::nullopt;
  return text ? started_of(*text) : std::nullopt;
}

}  // namespace report_format
