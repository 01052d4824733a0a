#include "mail/mail_summary.hpp"

#include <algorithm>
#include <cstddef>
#include <string_view>
#include <vector>

#include "report_format/reports.hpp"
#include "vorn/base/utf8.hpp"

namespace host {
namespace {

using report_format::Attention;
using report_format::escape_html;
using report_format::Facts;
using report_format::Incident;
using report_format::IncidentLevel;
using report_format::Level;
using report_format::name_in;
using report_format::TextForm;
using report_format::Texts;
using report_format::VolumeFacts;

// A mail stays small, whatever facts and profile hold; the page has it all.
constexpr std::size_t kMostNotices = 20;
constexpr std::size_t kMostReports = 32;
constexpr std::size_t kLongestReport = 64;
constexpr std::size_t kLongestNotice = 160;  // bytes, in a subject

// --- What there is to tell ----------------------------------------------------------------------

bool is_pressing(const Attention& entry) {
  return entry.level != Level::kOk;
}

bool has_error(const Facts& facts) {
  return std::any_of(facts.incidents.begin(), facts.incidents.end(), [](const Incident& incident) {
    return incident.level == IncidentLevel::kError;
  });
}

// The worst first, as attention has it already.
std::vector<Incident> sorted_incidents(const Facts& facts) {
  std::vector<Incident> sorted = facts.incidents;
  std::stable_sort(sorted.begin(), sorted.end(),
                   [](const Incident& a, const Incident& b) { return a.level > b.level; });
  return sorted;
}

// In the order of the page; without facts as the profile's list has them.
std::vector<std::string> report_names(const std::optional<Facts>& facts, std::string_view list) {
  std::vector<std::string> names;
  if (facts) {
    for (const auto& report : facts->reports) {
      names.push_back(report.name);
    }
    return names;
  }
  while (!list.empty()) {
    const std::size_t length =
        std::min(list.find_first_of(report_format::kListSeparators), list.size());
    if (length > 0) {
      names.emplace_back(list.substr(0, length));
    }
    list.remove_prefix(std::min(length + 1, list.size()));
  }
  return names;
}

// `text` or as much of it as a subject has room for.
std::string shortened(std::string_view text) {
  if (text.size() <= kLongestNotice) {
    return std::string(text);
  }
  std::size_t end = 0;
  for (std::size_t next = 0; next <= kLongestNotice;) {
    end = next;
    next += std::max(utf8_at(text.substr(next)).length, std::size_t{1});
  }
  return std::string(text.substr(0, end)) + "…";
}

// --- In words -----------------------------------------------------------------------------------

// A label and what stands behind it; without a label a sentence.
struct Line {
  std::string label;
  std::string text;
  std::string details = {};
};

// Says it in one of the two forms.
class Summary {
 public:
  Summary(const Texts& texts, TextForm form) : texts_(texts), form_(form) {}

  std::string say(std::string_view key, const Texts::Values& values = {}) const {
    return texts_.say(form_, "mail", key, values);
  }
  // A sentence about the profile, which is a subject as well.
  std::string about(std::string_view key, const MailTopic& topic, Texts::Values values = {}) const {
    values.emplace_back("profile", name_in(form_, topic.profile));
    values.emplace_back("host", name_in(form_, topic.host));
    values.emplace_back("time", name_in(form_, topic.time));
    return say(key, values);
  }

  std::string ready(const MailTopic& topic, const std::optional<Facts>& facts) const {
    return facts && has_error(*facts) ? about("readyIncomplete", topic) : about("ready", topic);
  }

  // The worst of it; empty when all is well.
  std::string headline(const Facts& facts) const {
    const auto entry = std::find_if(facts.attention.begin(), facts.attention.end(), is_pressing);
    if (entry != facts.attention.end()) {
      return texts_.attention(form_, *entry);
    }
    return facts.incidents.empty() ? "" : texts_.incident(form_, sorted_incidents(facts).front());
  }

  // What the report lacks: a sentence and, where it says more, the details.
  std::vector<Line> incidents(const Facts& facts) const {
    std::vector<Line> lines;
    for (const Incident& incident : sorted_incidents(facts)) {
      const std::string sentence = texts_.incident(form_, incident);
      const std::string details = name_in(form_, incident.text);
      lines.push_back({"", sentence, details == sentence ? "" : details});
    }
    return cut(std::move(lines));
  }

  // What became of the runs before this one, and of this one since its facts were closed.
  std::vector<std::string> late_news(const MailTopic& topic) const {
    std::vector<std::string> told;
    if (!topic.unfinished.empty()) {
      told.push_back(say("unfinished", {{"time", topic.unfinished}}));
    }
    if (!topic.missed.empty()) {
      told.push_back(say("missed", {{"time", topic.missed}}));
    }
    if (topic.is_missing_from_fleet) {
      told.push_back(say("missingFromFleet", {}));
    }
    return told;
  }

  // All the rest, but for the headline.
  std::vector<Line> lines(const MailTopic& topic, const std::optional<Facts>& facts) const {
    std::vector<Line> all;
    if (facts) {
      all = notices(*facts, true);
      if (!all.empty()) {
        all.erase(all.begin());  // the headline
      }
      all = cut(std::move(all));
      if (!facts->volumes.empty()) {
        all.push_back({say("volume"), volume(facts->volumes.front())});
      }
      const std::vector<Line> others = cut(notices(*facts, false));
      all.insert(all.end(), others.begin(), others.end());
    } else {
      all.push_back({"", say("noFigures")});
    }
    if (const std::string list = reports(report_names(facts, topic.report_list)); !list.empty()) {
      all.push_back({say("reports"), list});
    }
    all.push_back({say("made"), name_in(form_, topic.time)});
    return all;
  }

 private:
  std::vector<Line> notices(const Facts& facts, bool pressing) const {
    std::vector<Line> lines;
    for (const Attention& entry : facts.attention) {
      if (is_pressing(entry) == pressing) {
        lines.push_back({"", texts_.attention(form_, entry)});
      }
    }
    return lines;
  }

  std::vector<Line> cut(std::vector<Line> lines) const {
    if (lines.size() > kMostNotices) {
      const std::string left = std::to_string(lines.size() - kMostNotices);
      lines.resize(kMostNotices);
      lines.push_back({"", say("more", {{"n", left}})});
    }
    return lines;
  }

  std::string volume(const VolumeFacts& volume) const {
    std::string text = name_in(form_, volume.path);
    if (volume.size > 0) {
      text = say("with", {{"name", text}, {"value", own(texts_.percent(volume.percent))}});
    }
    for (const std::string& more : {texts_.outlook(form_, volume), texts_.basis(form_, volume)}) {
      join(text, more);
    }
    return text;
  }

  std::string reports(const std::vector<std::string>& names) const {
    std::string list;
    for (std::size_t i = 0; i < std::min(names.size(), kMostReports); ++i) {
      const std::string heading = texts_.report(names[i]);
      join(list,
           heading.empty() ? name_in(form_, names[i].substr(0, kLongestReport)) : own(heading));
    }
    return list;
  }

  // A text of this program's, such as a size.
  std::string own(const std::string& text) const {
    return form_ == TextForm::html ? escape_html(text) : text;
  }
  void join(std::string& list, const std::string& item) const {
    if (!item.empty()) {
      list += (list.empty() ? "" : say("separator")) + item;
    }
  }

  const Texts& texts_;
  TextForm form_;
};

std::string subject_of(const Summary& plain, const MailTopic& topic,
                       const std::optional<Facts>& facts) {
  const std::string notice = facts ? shortened(plain.headline(*facts)) : "";
  std::string subject = notice.empty() ? plain.about("subject", topic)
                                       : plain.about("subjectWith", topic, {{"notice", notice}});
  if (!facts || facts->incidents.empty()) {
    return subject;
  }
  const std::string count = std::to_string(facts->incidents.size());
  return has_error(*facts) ? plain.say("incomplete", {{"subject", subject}})
                           : plain.say("incidents", {{"subject", subject}, {"n", count}});
}

std::string paragraphs(const std::vector<std::string>& texts, const char* begin, const char* end) {
  std::string all;
  for (const std::string& text : texts) {
    all += begin + text + end;
  }
  return all;
}

// --- Plain --------------------------------------------------------------------------------------

std::string plain_body(const Summary& plain, const MailTopic& topic,
                       const std::optional<Facts>& facts) {
  const std::string headline = facts ? plain.headline(*facts) : "";
  std::string text = headline.empty() ? "" : headline + "\n\n";
  text += plain.ready(topic, facts) + "\n\n" + paragraphs(plain.late_news(topic), "", "\n\n");
  if (facts && !facts->incidents.empty()) {
    for (const auto& [label, sentence, details] : plain.incidents(*facts)) {
      text += sentence + "\n" + (details.empty() ? "" : "    " + details + "\n");
    }
    text += "\n";
  }
  for (const auto& [label, value, details] : plain.lines(topic, facts)) {
    text +=
        (label.empty() ? value : plain.say("line", {{"label", label}, {"value", value}})) + "\n";
  }
  return text + "\n" + topic.link + "\n";
}

// --- HTML ---------------------------------------------------------------------------------------

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

std::string html_incidents(const std::vector<Line>& incidents) {
  std::string list = "<ul>\n";
  for (const auto& [label, sentence, details] : incidents) {
    list += "<li>" + sentence + (details.empty() ? "" : "<br><small>" + details + "</small>") +
            "</li>\n";
  }
  return list + "</ul>\n";
}

std::string html_table(const std::vector<Line>& lines) {
  constexpr const char* kSentence = R"(<tr><td colspan="2" style="padding: 2px 0">)";
  constexpr const char* kLabel =
      R"(<tr><th scope="row" style="text-align: left; vertical-align: top; font-weight: normal; )"
      R"(padding: 2px 16px 2px 0">)";
  constexpr const char* kValue = R"(</th><td style="vertical-align: top; padding: 2px 0"><strong>)";
  std::string table = "<table style=\"border-collapse: collapse\">\n";
  for (const auto& [label, text, details] : lines) {
    if (label.empty()) {
      table.append(kSentence).append(text);
    } else {
      table.append(kLabel).append(label).append(kValue).append(text).append("</strong>");
    }
    table += "</td></tr>\n";
  }
  return table + "</table>\n";
}

std::string html_link(const std::string& link) {
  const std::string text = escape_html(link);
  return "<a href=\"" + text + R"(" style="word-break: break-all">)" + text + "</a>";
}

std::string html_body(const Summary& html, const MailTopic& topic,
                      const std::optional<Facts>& facts) {
  const std::string headline = facts ? html.headline(*facts) : "";
  std::string body = headline.empty() ? "" : "<p><strong>" + headline + "</strong></p>\n";
  body += "<p>" + html.ready(topic, facts) + "</p>\n" +
          paragraphs(html.late_news(topic), "<p>", "</p>\n");
  if (facts && !facts->incidents.empty()) {
    body += html_incidents(html.incidents(*facts));
  }
  return body + html_table(html.lines(topic, facts)) + "<p>" + html_link(topic.link) + "</p>\n";
}

}  // namespace

MailContent report_mail(const Texts& texts, const MailTopic& topic,
                        const std::optional<Facts>& facts) {
  const Summary plain(texts, TextForm::plain);
  MailContent mail;
  mail.subject = subject_of(plain, topic, facts);
  mail.plain = plain_body(plain, topic, facts);
  mail.html =
      html_page(texts, mail.subject, html_body(Summary(texts, TextForm::html), topic, facts));
  return mail;
}

MailContent failure_mail(const Texts& texts, const MailTopic& topic,
                         const std::vector<std::string>& log) {
  const Summary plain(texts, TextForm::plain);
  const Summary html(texts, TextForm::html);
  MailContent mail;
  mail.subject = plain.about("failedSubject", topic);
  mail.plain = plain.about("failed", topic) + "\n\n" +
               paragraphs(plain.late_news(topic), "", "\n\n") + plain.about("failedRemedy", topic) +
               "\n";
  std::string body = "<p>" + html.about("failed", topic) + "</p>\n" +
                     paragraphs(html.late_news(topic), "<p>", "</p>\n") + "<p>" +
                     html.about("failedRemedy", topic) + "</p>\n";
  if (!log.empty()) {
    mail.plain += "\n" + plain.say("failedLog") + "\n\n";
    body += "<p>" + html.say("failedLog") + "</p>\n<pre style=\"white-space: pre-wrap\">";
    for (const std::string& line : log) {
      mail.plain += "    " + name_in(TextForm::plain, line) + "\n";
      body += name_in(TextForm::html, line) + "\n";
    }
    body += "</pre>\n";
  }
  mail.html = html_page(texts, mail.subject, body);
  return mail;
}

MailContent test_mail(const Texts& texts, const MailTopic& topic) {
  const Summary plain(texts, TextForm::plain);
  const Summary html(texts, TextForm::html);
  MailContent mail;
  mail.subject = plain.about("testSubject", topic);
  mail.plain = plain.about("test", topic) + "\n";
  mail.html = html_page(texts, mail.subject, "<p>" + html.about("test", topic) + "</p>\n");
  return mail;
}

}  // namespace host
