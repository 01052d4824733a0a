// What is installed: the program, the template, the history and its schema, the folders' rights.
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstdlib>
#include <cstring>

#include "base/ask_program.hpp"
#include "base/ctl.hpp"
#include "doctor/doctor.hpp"
#include "schedule/jobs.hpp"
#include "vorn/admin/history.hpp"
#include "vorn/base/file_io.hpp"
#include "vorn/paths.h"

namespace ctl {
namespace {

constexpr const char* kReinstall = "install vornreport anew";
constexpr std::chrono::seconds kScriptLimit{10};

void check_program(Findings& findings) {
  if (access(kProgram, X_OK) == 0) {
    findings.ok("program", kProgram);
  } else {
    findings.add(Level::error, "program",
                 std::string(kProgram) + " can't be run (" + std::strerror(errno) + ")",
                 kReinstall);
  }
}

// The first line of what a step of the template script complained about; empty when it did its
// work.
std::string script_complaint(const std::vector<std::string>& arguments) try {
  const std::optional<Answer> step = ask_program(arguments, kScriptLimit);
  if (!step) {
    return arguments.front() + " is missing";
  }
  const std::string line = step->error.substr(0, step->error.find('\n'));
  return step->status == 0 ? "" : line.empty() ? arguments.front() + " failed" : line;
} catch (const Failure& failure) {
  return failure.what();
}

// Begins a page and makes a list of reports, as a run does.
void check_template(Findings& findings) {
  char folder[] = "/tmp/vornctl.XXXXXX";
  if (mkdtemp(folder) == nullptr) {
    findings.add(Level::error, "template",
                 "nothing can be made in /tmp (" + std::string(std::strerror(errno)) + ")",
                 "make room in /tmp");
    return;
  }
  const std::string page = std::string(folder) + "/page";
  std::string complaint = script_complaint({VORN_PATH_TEMPLATE_SCRIPT, "header", page});
  if (complaint.empty()) {
    complaint = script_complaint({VORN_PATH_TEMPLATE_SCRIPT, "lang", page, "en"});
  }
  if (complaint.empty()) {
    complaint = script_complaint({VORN_PATH_TEMPLATE_SCRIPT, "index"});
  }
  host::remove_tree(folder);
  if (complaint.empty()) {
    findings.ok("template", VORN_PATH_TEMPLATE_SCRIPT " and what it puts into the page");
  } else {
    findings.add(Level::error, "template", complaint, kReinstall);
  }
}

void check_database(Findings& findings) {
  if (const std::string problem = admin::schema_problem(); problem.empty()) {
    findings.ok("schema", VORN_PATH_HISTORY_SCHEMA);
  } else {
    findings.add(Level::error, "schema", VORN_PATH_HISTORY_SCHEMA " " + problem, kReinstall);
  }
  if (access(VORN_PATH_HISTORY_DB, F_OK) != 0) {
    findings.ok("history", "the first run makes " VORN_PATH_HISTORY_DB);
  } else if (const std::string problem = admin::history_problem(); problem.empty()) {
    findings.ok("history", VORN_PATH_HISTORY_DB);
  } else {
    findings.add(Level::error, "history", VORN_PATH_HISTORY_DB " " + problem,
                 "move it away, the next run begins a new one");
  }
}

// Runs have root's rights, so nobody else may decide what they execute, read and write there.
constexpr std::array kPlaces{"/usr/vorn",     "/usr/vorn/bin",  "/usr/vorn/vornreport",
                             "/usr/vorn/etc", VORN_PATH_CONFIG, VORN_PATH_SHARES,
                             VORN_PATH_STAT,  VORN_PATH_STATUS, VORN_PATH_REPORTS};

// What is wrong and what to do, or an empty text.
std::string rights_problem(const std::string& path) {
  struct stat status {};
  if (stat(path.c_str(), &status) != 0) {
    const bool is_made_by_run = path.starts_with("/usr/vorn/var") && errno == ENOENT;
    return is_made_by_run ? "" : std::string(std::strerror(errno)) + "; " + kReinstall;
  }
  if (status.st_uid != 0) {
    return "it doesn't belong to root; run chown root " + path;
  }
  return (status.st_mode & S_IWOTH) != 0 ? "everyone can write to it; run chmod o-w " + path : "";
}

void check_rights(Findings& findings) {
  bool all_right = true;
  for (const char* place : kPlaces) {
    if (std::string problem = rights_problem(place); !problem.empty()) {
      findings.add(Level::error, std::string("rights of ") + place, std::move(problem));
      all_right = false;
    }
  }
  if (all_right) {
    findings.ok("rights", "only root decides what is in /usr/vorn");
  }
}

}  // namespace

void check_product(Findings& findings) {
  check_program(findings);
  check_template(findings);
  check_database(findings);
  check_rights(findings);
}

}  // namespace ctl
