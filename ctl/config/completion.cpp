// vornctl complete: what can stand at a place of the command line, for the shells' completion.
#include <algorithm>
#include <memory>

#include "base/configuration.hpp"
#include "base/ctl.hpp"
#include "base/stored_reports.hpp"
#include "config/checks.hpp"
#include "config/commands.hpp"
#include "vorn/admin/messages.hpp"
#include "vorn/base/words.hpp"

namespace ctl {
namespace {

using Words = std::vector<std::string>;

// The values that a name or type of ctl.hpp stands for. FOLDER and FILE are the shell's own; they
// are answered by a line that no name can be.
Words values_of(const std::string& kind, const std::string& profile) {
  Words words;
  if (kind == "DATE" || kind == "DATE2") {
    const std::string folder = folder_of_reports(read_profile(profile));
    for (const admin::StoredReport& report : reports_in(folder, ReportSize::left_out)) {
      if (report.is_whole) {
        words.push_back(report.name);
      }
    }
  } else if (kind == "PROFILE") {
    for (const Section& section : read_profiles()) {
      words.push_back(section.name);
    }
  } else if (kind == "SHARE" || kind == "SHARES") {
    for (const Share& share : read_shares()) {
      words.push_back(share.name);
    }
  } else if (kind == "REPORTS") {
    words = report_names();
  } else if (kind == "LANGUAGE") {
    words = installed_languages();
  } else if (kind == "KEY") {
    for (const ProfileKey& key : profile_keys()) {
      words.emplace_back(key.name);
    }
  } else if (kind == "FOLDER" || kind == "FILE") {
    words = {kind == "FOLDER" ? "/folders" : "/files"};
  } else if (kind.find('|') != std::string::npos) {
    for (std::size_t start = 0; start <= kind.size();) {
      const std::size_t end = std::min(kind.find('|', start), kind.size());
      words.push_back(kind.substr(start, end - start));
      start = end + 1;
    }
  }
  return words;
}

// The words of a list are completed one by one.
Words list_values(const std::string& kind, const std::string& current, const std::string& profile) {
  Words words = values_of(kind, profile);
  const std::size_t comma = current.rfind(',');
  if ((kind == "SHARES" || kind == "REPORTS") && comma != std::string::npos) {
    const auto named = host::comma_words(std::string_view(current).substr(0, comma));
    std::erase_if(words, [&](const std::string& word) {
      return std::find(named.begin(), named.end(), word) != named.end();
    });
    for (std::string& word : words) {
      word.insert(0, current, 0, comma + 1);
    }
  }
  return words;
}

bool takes_value(const CLI::Option& option) {
  return option.get_items_expected_max() > 0;
}

// How far the words before the current one lead.
struct Place {
  const CLI::App* command = nullptr;
  const CLI::Option* waiting = nullptr;  // an option that wants its value
  Words positionals{};
};

Place place_of(const CLI::App& app, const Words& before) {
  Place place{&app};
  for (const std::string& word : before) {
    if (place.waiting != nullptr) {
      place.waiting = nullptr;
    } else if (word.starts_with('-')) {
      const CLI::Option* option = place.command->get_option_no_throw(word);
      place.waiting = option != nullptr && takes_value(*option) ? option : nullptr;
    } else {
      const auto commands = place.command->get_subcommands({});
      const auto found =
          std::find_if(commands.begin(), commands.end(),
                       [&](const CLI::App* command) { return command->get_name() == word; });
      if (found != commands.end()) {
        place.command = *found;
      } else {
        place.positionals.push_back(word);
      }
    }
  }
  return place;
}

// The shells ask at every key, so a word that is no key is no failure.
std::string type_of_key(const std::string& name) try {
  return profile_key(name).type;
} catch (const Failure&) {
  return "";
}

Words positional_values(const Place& place, const std::string& previous,
                        const std::string& current) {
  Words kinds;
  for (const CLI::Option* option : place.command->get_options()) {
    if (option->get_positional()) {
      kinds.push_back(option->get_name(true));
    }
  }
  std::size_t index = place.positionals.size();
  if (place.command->get_allow_extras() && kinds.size() >= 2) {
    while (index >= kinds.size()) {
      index -= 2;  // further pairs of key and value
    }
  }
  if (index >= kinds.size()) {
    return {};
  }
  return list_values(kinds[index] == "VALUE" ? type_of_key(previous) : kinds[index], current,
                     place.positionals.empty() ? "" : place.positionals.front());
}

Words candidates(const CLI::App& app, Words before, const std::string& current) {
  const bool is_option = current.starts_with('-');
  const bool is_help = !before.empty() && before.front() == "help";
  if (is_help) {
    before.erase(before.begin());
  } else if (before == Words{"reports"} && !is_option) {
    return values_of("PROFILE", "");
  }
  // The action that may follow in its place is none yet, nor has a help a profile before it.
  const bool is_reports = !before.empty() && before.front() == "reports" && !is_option;
  const bool wants_action = is_reports && before.size() == (is_help ? 1 : 2);
  const Place place = place_of(app, wants_action ? Words{"reports"} : in_parse_order(before));
  if (place.waiting != nullptr) {
    return list_values(place.waiting->get_type_name(), current, "");
  }
  Words words;
  if (is_option) {
    for (const CLI::Option* option : place.command->get_options()) {
      if (!option->get_lnames().empty() && option->get_group() != kOldSpellings) {
        words.push_back("--" + option->get_lnames().front());
      }
    }
    return words;
  }
  for (const CLI::App* command : place.command->get_subcommands({})) {
    if (!command->get_group().empty()) {
      words.push_back(command->get_name());
    }
  }
  return words.empty() ? positional_values(place, before.empty() ? "" : before.back(), current)
                       : words;
}

}  // namespace

void complete(const CLI::App& app, std::vector<std::string> words) try {
  const std::string current = words.empty() ? "" : words.back();
  if (!words.empty()) {
    words.pop_back();
  }
  for (const std::string& candidate : candidates(app, words, current)) {
    if (candidate.starts_with(current) || candidate == "/files" || candidate == "/folders") {
      print_line(candidate);
    }
  }
  admin::take_messages();  // nobody wants to read them in the middle of a command line
} catch (const Failure&) {
  admin::take_messages();
}

}  // namespace ctl
