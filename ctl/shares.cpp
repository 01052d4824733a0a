// vornctl share: the shares that reports cover.
#include <memory>
#include <nlohmann/json.hpp>

#include "config.hpp"
#include "ctl.hpp"

namespace ctl {
namespace {

void list_shares(bool json) {
  const std::vector<host::Share> shares = read_shares();
  nlohmann::ordered_json list = nlohmann::ordered_json::array();
  Table table({{"SHARE"}, {"FOLDER"}, {"FILE INDEX"}});
  for (const host::Share& share : shares) {
    list.push_back({{"name", share.name}, {"path", share.path}, {"file_index", share.file_index}});
    table.add({share.name, share.path, share.file_index});
  }
  json ? print_json(list) : table.print();
}

}  // namespace

void add_share_commands(CLI::App& app) {
  CLI::App& group = *app.add_subcommand("share", "The shares that reports cover");
  group.require_subcommand(1);
  const auto json = std::make_shared<bool>();
  CLI::App& list = *group.add_subcommand("list", "Print every share");
  add_json_flag(list, *json);
  list.callback([json] { list_shares(*json); });
}

}  // namespace ctl
