#include "mail/mail_summary.hpp"

#include <algorithm>
#include <cstddef>
#include <string_view>
#include <utility>
#include <vector>

namespace host {
namespace {

using report_format::escape_html;
using report_format::name_in;
using report_format::TextForm;

constexpr std::size_t kMostUsers = 5;
// A profile names nine reports; whatever else stands in its list has no right to a long mail.
constexpr std::size_t kMostReports = 32;
constexpr std::size_t kLongestReport = 64;

// A label and what stands behind it.
using Fact = std::pair<std::string, std::string>;

// Says the figures in one of the two forms.
class Summary {
 public:
  Summary(const Texts& texts, TextForm form) : texts_(texts), form_(form) {}

  std::vector<Fact> facts(const MailTopic& topic, const ReportFigures& figures) const {
    std::vector<Fact> all;
    if (figures.volume) {
      add_volume(all, *figures.volume);
    }
    if (figures.share) {
      all.emplace_back(say("largestShare"),
                       with(figures.share->name, texts_.size(figures.share->size)));
    }
    if (figures.quota) {
      all.emplace_back(say("usersOver", {{"percent", own(texts_.percent(90))}}),
                       users(*figures.quota));
    }
    if (figures.duplicates && figures.duplicates->bytes > 0) {
      add_duplicates(all, *figures.duplicates);
    }
    if (const std::string reports = report_names(topic.report_list); !reports.empty()) {
      all.emplace_back(say("reports"), reports);
    }
    all.emplace_back(say("made"), name(topic.time));
    return all;
  }

  std::string say(std::string_view key, const Texts::Values& values = {}) const {
    return texts_.say(form_, "mail", key, values);
  }
  std::string name(std::string_view text) const { return name_in(form_, text); }

 private:
  // A text of this program's, such as a size.
  std::string own(const std::string& text) const {
    return form_ == TextForm::html ? escape_html(text) : text;
  }
  std::string with(std::string_view what, const std::string& value) const {
    return say("with", {{"name", name(what)}, {"value", own(value)}});
  }
  void join(std::string& list, const std::string& item) const {
    list += (list.empty() ? "" : say("separator")) + item;
  }

  void add_volume(std::vector<Fact>& all, const FullestVolume& volume) const {
    all.emplace_back(say("fullestVolume"), with(volume.name, texts_.percent(volume.percent)));
    if (volume.outlook != Outlook::unknown) {
      all.emplace_back(say("daysUntilFull"), volume.outlook == Outlook::days
                                                 ? std::to_string(volume.days)
                                             : volume.outlook == Outlook::soon ? say("lessThanOne")
                                                                               : say("noGrowth"));
    }
  }

  std::string users(const QuotaFigures& quota) const {
    std::string list;
    for (std::size_t i = 0; i < std::min(quota.users.size(), kMostUsers); ++i) {
      join(list, with(quota.users[i].first, texts_.percent(quota.users[i].second)));
    }
    if (quota.users.size() > kMostUsers) {
      list =
          say("andMore", {{"list", list}, {"n", std::to_string(quota.users.size() - kMostUsers)}});
    }
    if (list.empty()) {
      list = say("none");
    }
    return !quota.is_cut
               ? list
               : say("usersCut", {{"list", list}, {"n", std::to_string(kMostQuotaUsers)}});
  }

  void add_duplicates(std::vector<Fact>& all, const DuplicateFigures& duplicates) const {
    const std::string size = own(texts_.size(duplicates.bytes));
    all.emplace_back(
        say(duplicates.is_confirmed ? "confirmedDuplicates" : "possibleDuplicates"),
        duplicates.is_cut
            ? say("atLeast", {{"size", size}, {"n", std::to_string(kMostDuplicateGroups)}})
            : size);
  }

  std::string report_names(std::string_view report_list) const {
    constexpr std::string_view kSeparators = ", \t;";
    std::string names;
    std::size_t count = 0;
    while (!report_list.empty() && count < kMostReports) {
      const std::string_view word = report_list.substr(0, report_list.find_first_of(kSeparators));
      if (!word.empty()) {
        const std::string heading = texts_.report(word);
        join(names, heading.empty() ? name(word.substr(0, kLongestReport)) : own(heading));
        ++count;
      }
      report_list.remove_prefix(std::min(word.size() + 1, report_list.size()));
    }
    return names;
  }

  const Texts& texts_;
  TextForm form_;
};

std::string html_page(const Texts& texts, const std::string& title, const std::string& body) {
  return R"(<!DOCTYPE html>
<html lang=")" +
         escape_html(texts.language()) + R"(">
<head>
<meta charset="utf-8">
<meta name="color-scheme" content="light dark">
<meta name="supported-color-schemes" content="light dark">
<title>)" +
         escape_html(title) +
         R"(</title>
</head>
<body style="font-family: sans-serif; line-height: 1.5">
)" + body +
         "</body>\n</html>\n";
}

std::string html_table(const std::vector<Fact>& facts) {
  constexpr const char* kLabel =
      R"(<tr><th scope="row" style="text-align: left; vertical-align: top; font-weight: normal; )"
      R"(padding: 2px 16px 2px 0">)";
  constexpr const char* kValue = R"(</th><td style="vertical-align: top; padding: 2px 0"><strong>)";
  std::string table = "<table style=\"border-collapse: collapse\">\n";
  for (const auto& [label, value] : facts) {
    table.append(kLabel).append(label).append(kValue).append(value);
    table += "</strong></td></tr>\n";
  }
  return table + "</table>\n";
}

std::string html_link(const std::string& link) {
  const std::string text = escape_html(link);
  return "<a href=\"" + text + R"(" style="word-break: break-all">)" + text + "</a>";
}

// A sentence about the profile, which is a subject as well.
std::string about(const Summary& summary, std::string_view key, const MailTopic& topic) {
  return summary.say(key, {{"profile", summary.name(topic.profile)},
                           {"host", summary.name(topic.host)},
                           {"time", summary.name(topic.time)}});
}

}  // namespace

MailContent report_mail(const Texts& texts, const MailTopic& topic, const ReportFigures& figures) {
  const Summary plain(texts, TextForm::plain);
  const Summary html(texts, TextForm::html);
  MailContent mail;
  mail.subject = about(plain, "subject", topic);
  mail.plain = about(plain, "ready", topic) + "\n\n";
  for (const auto& [label, value] : plain.facts(topic, figures)) {
    mail.plain += plain.say("line", {{"label", label}, {"value", value}}) + "\n";
  }
  mail.plain += "\n" + topic.link + "\n";
  mail.html = html_page(texts, mail.subject,
                        "<p>" + about(html, "ready", topic) + "</p>\n" +
                            html_table(html.facts(topic, figures)) + "<p>" + html_link(topic.link) +
                            "</p>\n");
  return mail;
}

MailContent test_mail(const Texts& texts, const MailTopic& topic) {
  const Summary plain(texts, TextForm::plain);
  const Summary html(texts, TextForm::html);
  MailContent mail;
  mail.subject = about(plain, "testSubject", topic);
  mail.plain = about(plain, "test", topic) + "\n";
  mail.html = html_page(texts, mail.subject, "<p>" + about(html, "test", topic) + "</p>\n");
  return mail;
}

}  // namespace host
