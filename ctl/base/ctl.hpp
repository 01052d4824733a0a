// What the commands of vornctl share. Each command has a file of its own, which adds it to the
// command line (see commands.hpp of its group) and runs it in its callback.
//
// Exit status: 0 when all went well, 1 when the command failed, 2 when the command line is wrong, 3
// when a report was made that lacks something.
// Results go to standard output, everything else to standard error.
#ifndef VORN_CTL_CTL_HPP
#define VORN_CTL_CTL_HPP

#include <CLI/App.hpp>
#include <array>
#include <cstddef>
#include <nlohmann/json_fwd.hpp>
#include <stdexcept>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace ctl {

inline constexpr int kFailed = 1;
inline constexpr int kWrongUsage = 2;
inline constexpr int kWithIncidents = 3;

// Ends the command. The message is one line that says what is wrong and what to do; main prints it
// after "vornctl: ". An empty one prints nothing, for a command that has said all.
class Failure : public std::runtime_error {
 public:
  explicit Failure(const std::string& message, int exit_code = kFailed)
      : std::runtime_error(message), exit_code_(exit_code) {}
  int exit_code() const { return exit_code_; }

 private:
  int exit_code_;
};

// --- The command line ---------------------------------------------------------------------------

// Arguments and options whose name or type is one of these are completed with what they stand for:
// PROFILE, SHARE, SHARES, REPORTS, LANGUAGE, KEY, DATE, FOLDER, FILE; so are words with '|'
// between. The positional argument PROFILE, required. The profile need not exist.
CLI::Option* add_profile_argument(CLI::App& command, std::string& profile);
// The same for a share.
CLI::Option* add_share_argument(CLI::App& command, std::string& share);
// The positional arguments KEY VALUE, any number of pairs.
void add_pairs(CLI::App& command);
// Those that were given. Throws a Failure for a key without a value.
std::vector<std::pair<std::string, std::string>> pairs_of(const CLI::App& command);
// The group of options that are taken, but neither shown in a help nor completed.
inline constexpr const char* kOldSpellings = "";
CLI::Option* add_json_flag(CLI::App& command, bool& json);

// What can stand behind `reports PROFILE`; the first when nothing does.
inline constexpr std::array kReportActions{"list", "open", "compare", "remove", "keep"};
// The words of a command line as they are parsed: people write `reports PROFILE ACTION`, the parser
// reads `reports ACTION PROFILE`, so that a profile can have any name.
std::vector<std::string> in_parse_order(std::vector<std::string> words);

// --- The platform's messages --------------------------------------------------------------------

// The last one since they were taken as a failure, those before it printed; `otherwise` when there
// is none. main prints what nobody took.
Failure host_failure(const std::string& otherwise);

// --- Output -------------------------------------------------------------------------------------

// `text` for one line of a terminal: control characters, what turns the direction of text, and
// bytes that are no UTF-8 come out as \x1b, \u202e, \xff.
std::string printable(std::string_view text);
// `word` as a shell takes it for one word, for commands in remedies.
std::string shell_word(const std::string& word);
// The columns that a printable text takes.
std::size_t display_width(std::string_view text);

void print_line(std::string_view line);  // to standard output, made printable
void warn(std::string_view line);        // to standard error, after "vornctl: "
// Indented, with a line end. Bytes that are no UTF-8 come out as U+FFFD.
void print_json(const nlohmann::ordered_json& json);

// Columns aligned by display width, two spaces between them; cells are made printable.
class Table {
 public:
  enum class Align { left, right };
  struct Column {
    std::string header;
    Align align = Align::left;
  };

  explicit Table(std::vector<Column> columns) : columns_(std::move(columns)) {}
  // As many cells as there are columns.
  void add(std::vector<std::string> row);
  bool empty() const { return rows_.empty(); }
  std::string text() const;
  void print() const;

 private:
  std::vector<Column> columns_;
  std::vector<std::vector<std::string>> rows_;
};

}  // namespace ctl

#endif
