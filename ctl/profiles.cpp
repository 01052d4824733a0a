// vornctl profile: what is reported, and for whom.
#include <memory>
#include <nlohmann/json.hpp>

#include "config.hpp"
#include "ctl.hpp"

namespace ctl {
namespace {

nlohmann::ordered_json as_json(const Section& profile) {
  nlohmann::ordered_json json{{"name", profile.name}};
  for (const auto& [key, value] : profile.entries) {
    json[key] = value;
  }
  return json;
}

void list_profiles(bool json) {
  nlohmann::ordered_json list = nlohmann::ordered_json::array();
  Table table({{"PROFILE"}, {"REPORTS"}, {"SHARES"}, {"MAIL TO"}});
  for (const Section& profile : read_profiles()) {
    list.push_back(as_json(profile));
    table.add({profile.name, profile.value("report_list", "-"), profile.value("share_list", "all"),
               profile.value("mail_to", "-")});
  }
  json ? print_json(list) : table.print();
}

}  // namespace

void add_profile_commands(CLI::App& app) {
  CLI::App& group = *app.add_subcommand("profile", "What is reported, and for whom");
  group.require_subcommand(1);
  const auto json = std::make_shared<bool>();
  CLI::App& list = *group.add_subcommand("list", "Print every profile");
  add_json_flag(list, *json);
  list.callback([json] { list_profiles(*json); });
}

}  // namespace ctl
