// The fleet as the program has it.
#include "vorn/fleet.h"

#include <algorithm>
#include <array>
#include <cstddef>
#include <exception>
#include <memory>
#include <string>
#include <vector>

#include "fleet/engine.hpp"
#include "fleet/fleet_conf.hpp"
#include "fleet/fleet_tables.hpp"

struct VORNFleet {
  std::unique_ptr<host::Engine> engine;  // null when it can't be worked with
  std::string problem;
  std::vector<std::size_t> answering;  // nodes, when runs were asked for last
};

namespace {

bool hand_out(const std::vector<host::FleetRun>& runs, bool are_ahead, VORNFleetRow row,
              void* context) {
  return std::all_of(runs.begin(), runs.end(), [&](host::FleetRun run) {
    std::array<std::string, 5> texts{std::to_string(run.run), std::to_string(run.started),
                                     std::to_string(run.interval), are_ahead ? "1" : "0",
                                     run.has_shared_number ? "1" : "0"};
    std::array<char*, 7> values{run.server.data(), run.profile.data(), texts[0].data(),
                                texts[1].data(),   texts[2].data(),    texts[3].data(),
                                texts[4].data()};
    char* no_names[1] = {};
    return row(context, values.size(), values.data(), static_cast<char**>(no_names)) == 0;
  });
}

// Runs `call` with the engine. 0, or -1 with the problem kept.
template <typename Call>
int with_engine(VORNFleet* fleet, Call&& call) {
  if (fleet == nullptr || !fleet->engine) {
    return -1;
  }
  try {
    if (call(*fleet->engine)) {
      return 0;
    }
    fleet->problem = fleet->engine->problem();
  } catch (const std::exception& error) {
    fleet->problem = error.what();
  }
  return -1;
}

}  // namespace

int VORNFleetOpen(VORNFleet** fleet) {
  if (fleet == nullptr) {
    return -1;
  }
  *fleet = nullptr;
  try {
    host::FleetReading reading = host::read_fleet_conf();
    if (!reading.conf && reading.problem.empty()) {
      return 1;
    }
    auto made = std::make_unique<VORNFleet>();
    made->problem = std::move(reading.problem);
    if (reading.conf) {
      made->engine = std::make_unique<host::Engine>(*reading.conf);
    }
    *fleet = made.release();
    return (*fleet)->engine ? 0 : -1;
  } catch (const std::exception&) {
    return -1;
  }
}

void VORNFleetClose(VORNFleet* fleet) {
  delete fleet;
}

const char* VORNFleetServer(const VORNFleet* fleet) {
  return fleet != nullptr && fleet->engine ? fleet->engine->conf().server.c_str() : "";
}

const char* VORNFleetProblem(const VORNFleet* fleet) {
  return fleet != nullptr ? fleet->problem.c_str() : "there is no memory for it";
}

int VORNFleetInsert(VORNFleet* fleet, const char* table, VORNFleetFormat format,
                    VORNFleetSource source, void* const* contexts, size_t count) {
  return with_engine(fleet, [&](host::Engine& engine) {
    std::vector<host::Engine::Source> sources;
    for (size_t i = 0; i < count; ++i) {
      sources.emplace_back([source, context = contexts[i]](char* out, std::size_t size) {
        return source(context, out, size);
      });
    }
    return engine.insert(table, format == VORN_FLEET_BINARY ? "RowBinary" : "TabSeparated",
                         sources);
  });
}

int VORNFleetRuns(VORNFleet* fleet, VORNFleetRow row, void* context) {
  std::string problem;
  const int done = with_engine(fleet, [&](host::Engine& engine) {
    host::FleetListing listing;
    problem = host::list_runs(engine, listing);
    for (const std::size_t node : listing.answering) {
      if (problem.empty() && !fleet->answering.empty() &&
          std::find(fleet->answering.begin(), fleet->answering.end(), node) ==
              fleet->answering.end()) {
        problem = engine.conf().urls[node] + " came back meanwhile; try again";
      }
    }
    fleet->answering = listing.answering;
    return problem.empty() && hand_out(listing.complete, false, row, context) &&
           hand_out(listing.ahead, true, row, context);
  });
  if (done < 0 && !problem.empty()) {
    fleet->problem = problem;
  }
  return done;
}

int VORNFleetSelect(VORNFleet* fleet, const char* sql, VORNFleetRow row, void* context) {
  return with_engine(fleet, [&](host::Engine& engine) {
    char* no_names[1] = {};
    return engine.select(sql, [&](std::vector<char*>& fields) {
      return row(context, static_cast<int>(fields.size()), fields.data(),
                 static_cast<char**>(no_names)) == 0;
    });
  });
}
