// Dictionaries for tests of what facts say: the group "mail" is the product's, the others are
// these.
#pragma once

#include <nlohmann/json.hpp>
#include <string>

#include "support.hpp"

namespace support {

constexpr const char* kEnglish = R"json({
  "facts": {
    "full": "full",
    "fillsToday": "full within a day",
    "fillsDay": "full in about 1 day ({low} to {high})",
    "fillsDays": "full in about {n} days ({low} to {high})",
    "fillsYears": "full in about {n} years ({low} to {high})",
    "steady": "does not grow",
    "shrinking": "shrinks",
    "shortSpan": "too little history: {n} of {m} days",
    "shortDays": "too little history: samples of {n} of {m} days",
    "pace": "at the pace of the last {n} days",
    "jumped": "jumped by {size} on {date}",
    "fell": "fell by {size} on {date}",
    "unknownSize": "size unknown"
  },
  "attention": {
    "volume_full": "{volume}: full",
    "volume_fills": "{volume}: {outlook}",
    "volume_used": "{volume}: {percent} used, {free} free",
    "quota_over": "{user} is over the quota on {volume}: {used} of {quota}",
    "quota_near": "{user} has used {percent} of the quota on {volume}",
    "quota_more": "Further users near or over their quota: {n}",
    "share_largest": "The largest share is {share} with {bytes}",
    "data_oldest": "The oldest data is from {date}: {file}"
  },
  "incidents": {
    "share_missing": "Share {what} is missing from this report",
    "share_part": "Part of a share could not be read ({what})"
  }
})json";

// Only what tells another language from English.
constexpr const char* kGerman = R"json({
  "facts": {"fillsDays": "<voll in> {n} Tagen ({low} bis {high})"},
  "attention": {"volume_used": "{volume}: zu {percent} belegt, {free} frei"},
  "incidents": {"share_missing": "Freigabe {what} fehlt"}
})json";

inline void write_dictionaries(const std::string& folder) {
  for (const auto& [code, groups] : {std::pair("en", kEnglish), std::pair("de", kGerman)}) {
    const std::string name = std::string("/") + code + ".json";
    auto texts =
        nlohmann::json::parse(read_file(VORN_TEST_SOURCE_DIR "/reportUI/template/lang" + name));
    texts.update(nlohmann::json::parse(groups));
    write_file(folder + name, texts.dump());
  }
}

}  // namespace support
