#include "facts_scan.hpp"

#include <nlohmann/json.hpp>
#include <utility>
#include <vector>

#include "report_format/facts.hpp"

namespace report_format {
namespace {

// Each function returns whether to go on.
class Scan : public nlohmann::json_sax<nlohmann::json> {
 public:
  bool null() override { return value(); }
  bool boolean(bool /*value*/) override { return value(); }
  bool number_integer(std::int64_t /*value*/) override { return value(); }
  bool number_unsigned(std::uint64_t /*value*/) override { return value(); }
  bool number_float(double /*value*/, const std::string& /*text*/) override { return value(); }
  bool string(std::string& /*value*/) override { return value(); }
  bool binary(nlohmann::json::binary_t& /*value*/) override { return value(); }
  bool start_object(std::size_t /*size*/) override { return open(); }
  bool start_array(std::size_t /*size*/) override { return open(); }
  bool end_object() override { return close(); }
  bool end_array() override { return close(); }
  bool parse_error(std::size_t /*at*/, const std::string& /*token*/,
                   const nlohmann::detail::exception& /*error*/) override {
    return false;
  }

 protected:
  virtual bool value() { return true; }
  virtual bool open() = 0;
  virtual bool close() = 0;
};

// Stops at the first value of the object's own key "started".
class StartedFinder : public Scan {
 public:
  std::optional<std::int64_t> found;

  bool number_unsigned(std::uint64_t number) override {
    if (is_wanted_ && number <= INT64_MAX) {
      found = static_cast<std::int64_t>(number);
    }
    return value();
  }
  bool key(std::string& name) override {
    is_wanted_ = depth_ == 1 && name == "started";
    return true;
  }

 private:
  bool value() override { return !std::exchange(is_wanted_, false); }
  bool open() override {
    ++depth_;
    return value();
  }
  bool close() override {
    --depth_;
    return true;
  }

  int depth_ = 0;
  bool is_wanted_ = false;
};

// Stops at the first object of too many keys.
class KeyCounter : public Scan {
 public:
  bool too_many = false;

  bool key(std::string& /*name*/) override {
    too_many = ++counts_.back() > kMostKeys;
    return !too_many;
  }

 private:
  bool open() override {
    counts_.push_back(0);
    return true;
  }
  bool close() override {
    counts_.pop_back();
    return true;
  }

  std::vector<std::size_t> counts_;  // keys of the values that are open
};

}  // namespace

bool has_object_of_many_keys(std::string_view text) {
  KeyCounter counter;
  nlohmann::json::sax_parse(text, &counter);
  return counter.too_many;
}

std::optional<std::int64_t> started_of(std::string_view text) {
  StartedFinder finder;
  nlohmann::json::sax_parse(text, &finder);
  return finder.found;
}

}  // namespace report_format
