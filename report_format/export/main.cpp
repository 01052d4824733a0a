// Prints, as JSON, what the page's script and the tests must know of reports and facts: the build
// hands it to them, so that nothing of it is written twice.
#include <cstdio>
#include <exception>
#include <nlohmann/json.hpp>

#include "report_format/attention.hpp"
#include "report_format/facts.hpp"
#include "report_format/reports.hpp"

namespace {

using Json = nlohmann::ordered_json;

Json reports() {
  constexpr const char* kCounted[] = {"rows", "groups", "rows of each table"};
  Json all = Json::array();
  for (const report_format::ReportFormat* report : report_format::kReports) {
    all.push_back({{"name", report->name},
                   {"variable", report->variable},
                   {"columns", report->columns},
                   {"page_limit", report->page_limit},
                   {"csv_limit", report->csv_limit},
                   {"limit_of", kCounted[static_cast<std::size_t>(report->limit_of)]},
                   {"has_csv_rows", report->has_csv_rows}});
  }
  return all;
}

Json attention() {
  Json all = Json::object();
  for (const report_format::AttentionFormat& format : report_format::attention_formats()) {
    Json values = Json::object();
    for (const report_format::ValueFormat& value : format.values) {
      values[std::string(value.name)] = report_format::word_of(value.kind);
    }
    all[std::string(format.code)] = {{"section", format.section}, {"values", values}};
  }
  return all;
}

Json incidents() {
  Json all = Json::array();
  for (const report_format::IncidentKind& kind : report_format::kIncidentKinds) {
    all.push_back(kind.kind);
  }
  return all;
}

}  // namespace

int main() try {
  const Json json{{"facts_variable", report_format::kFactsVariable},
                  {"reports", reports()},
                  {"attention", attention()},
                  {"incidents", incidents()}};
  return std::puts(json.dump(1).c_str()) >= 0 && std::fflush(stdout) == 0 ? 0 : 1;
} catch (const std::exception& error) {
  std::fprintf(stderr, "%s\n", error.what());
  return 1;
}
