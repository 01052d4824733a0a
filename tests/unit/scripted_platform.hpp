// A platform that does what a test tells it, linked in place of the host: every call is recorded,
// any call can be made to fail. Its base, text containers and formats, is the real one.
#pragma once

#include <functional>
#include <map>
#include <set>
#include <string>
#include <vector>

#include "vorn/text.h"

using TextMap = std::map<std::string, std::string>;

struct ScriptedPlatform {
  // What the calls answer.
  std::set<std::string> failing;                            // names of calls that fail
  std::set<std::string> running;                            // profiles held by another process
  std::map<std::string, TextMap> config;                    // sections of vornreport.conf
  TextMap real_paths;                                       // what VornQazInitRealPath adds
  TextMap locations;                                        // what VornQazInitLocation adds
  std::vector<std::pair<std::string, std::string>> shares;  // name and folder
  TextMap indexes;                                          // share to its index database
  TextMap volumes;                                          // share to mount path
  TextMap volume_ids;                                       // mount path to identifier
  TextMap file_types;                                       // extension to label
  std::map<std::string, unsigned> users;                    // name to uid
  struct Volume {
    std::string path;
    unsigned long long free_size;
    unsigned long long total_size;
  };
  std::vector<Volume> mounted;
  TextMap volumes_of;  // folder to mount path, for what lies in it; else "/"
  std::vector<std::string> shared_mounts;
  std::set<std::string> quotas;  // mount paths of volumes that keep them
  std::vector<std::string> progress;
  std::map<std::string, std::string>
      digests;  // path to MD5 text; "2" or "-1": that result; "w": 2, leased
  std::function<bool()> is_past_deadline;            // of the digests; never when it is empty
  void (*step)(unsigned long long bytes) = nullptr;  // of the digests
  std::set<std::string> unselected;                  // shares that the profile leaves out
  int fs_kind = 1;
  std::map<std::string, int> fs_kinds;  // for single folders
  std::string language = "en";
  std::string link = "http://files.example/report.html";
  int schedule_clean = 0;

  // What was called, as "Name argument argument", those that only look up left out.
  std::vector<std::string> calls;

  bool fails(const std::string& name) const { return failing.count(name) != 0; }
};

// Begins each test empty.
extern ScriptedPlatform platform;
