// The checks of vornctl doctor: what a run needs, looked at without running.
#ifndef VORN_CTL_DOCTOR_HPP
#define VORN_CTL_DOCTOR_HPP

#include <string>
#include <string_view>
#include <vector>

#include "base/configuration.hpp"

namespace ctl {

enum class Level {
  ok,
  warning,  // runs go on, with less than they could
  error     // something that was asked for will not happen
};

struct Finding {
  Level level = Level::ok;
  std::string subject;
  std::string text;
  std::string remedy;  // empty when all is well
};

class Findings {
 public:
  void ok(std::string subject, std::string text) {
    all_.push_back({Level::ok, std::move(subject), std::move(text), {}});
  }
  // A `text` without a `remedy` of its own is taken apart at its last "; ".
  void add(Level level, std::string subject, std::string text, std::string remedy = {});
  const std::vector<Finding>& all() const { return all_; }

 private:
  std::vector<Finding> all_;
};

// What the checks look at; whatever can't be read is left out and has a finding.
struct Configuration {
  std::vector<Section> profiles;  // without "global"
  std::vector<Share> shares;
};

void check_product(Findings& findings);
Configuration check_configuration(Findings& findings);
void check_shares(Findings& findings, const Configuration& configuration);
void check_quota_tool(Findings& findings, const Configuration& configuration);
void check_mail(Findings& findings, const Configuration& configuration);
void check_space(Findings& findings, const Configuration& configuration);
void check_clock(Findings& findings);
void check_schedules(Findings& findings, const Configuration& configuration);
void check_last_runs(Findings& findings, const Configuration& configuration);

}  // namespace ctl

#endif
