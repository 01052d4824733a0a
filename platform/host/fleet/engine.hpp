// The fleet's engine over its HTTP interface. Every wait is bounded; redirects and proxies are
// never followed; a server's certificate is always verified.
#ifndef VORN_HOST_FLEET_ENGINE_HPP
#define VORN_HOST_FLEET_ENGINE_HPP

#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "fleet/fleet_conf.hpp"

namespace host {

class Engine {
 public:
  explicit Engine(const FleetConf& conf);
  Engine(const Engine&) = delete;
  Engine& operator=(const Engine&) = delete;
  ~Engine();

  // A row's fields, each ended by a NUL; null for an absent value. False ends the reading.
  using OnRow = std::function<bool(std::vector<char*>& fields)>;
  // Runs a statement that gives rows. None is handed out before the engine has all of them, so that
  // what fails half-way isn't taken for less; they arrive one by one. False when it failed, or
  // `on_row` was false. Other nodes are tried while none was handed out.
  bool select(const std::string& sql, const OnRow& on_row);

  // Fills `out` with the next bytes of rows; 0 at their end.
  using Source = std::function<std::size_t(char* out, std::size_t size)>;
  // Sends the rows of each source to `table`, in the engine's `format`, beside each other,
  // compressed unless the node is this machine's own. All of them are in their place when it
  // returns true; after false nobody knows how many are. The node that keeps this server's rows is
  // asked first, and others as long as nothing was asked of a source.
  bool insert(const std::string& table, const char* format, const std::vector<Source>& sources);

  // Runs a statement on one node, outside of the configured database.
  bool execute(std::size_t node, const std::string& sql);
  bool select_on(std::size_t node, const std::string& sql, const OnRow& on_row);
  std::size_t nodes() const;
  const FleetConf& conf() const;

  // Whether the last failure was of the way to a node, not a node's word.
  bool is_silent() const;
  // What the last failure was, as one sentence without an end.
  const std::string& problem() const;

 private:
  class Transfer;
  class Beside;
  std::unique_ptr<Transfer> transfer_;
  std::unique_ptr<Beside> inserts_;
};

}  // namespace host

#endif
