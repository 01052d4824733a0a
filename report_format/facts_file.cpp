#include "report_format/facts_file.hpp"

#include <fcntl.h>

#include "report_format/reports.hpp"
#include "vorn/base/file_io.hpp"

namespace report_format {

namespace {

std::optional<Facts> read_facts_at(int folder, const char* path) {
  const host::ErrnoKeeper keeper;
  const host::Fd file = host::open_regular(folder, path);
  const auto text = file ? host::read_start(file.get(), kLargestFacts + 1) : std::nullopt;
  return text && text->size() <= kLargestFacts ? facts_of(*text) : std::nullopt;
}

}  // namespace

std::optional<Facts> read_facts(const std::string& report_folder) {
  return read_facts_at(AT_FDCWD, (report_folder + "/" + kFactsFile).c_str());
}

std::optional<Facts> read_facts(int report_folder) {
  return read_facts_at(report_folder, kFactsFile);
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
