// A driver, its link and the simulated receiver at the other end.
#ifndef RCVLINK_TESTS_SUPPORT_SIMULATED_DRIVER_H_
#define RCVLINK_TESTS_SUPPORT_SIMULATED_DRIVER_H_

#include <memory>
#include <sstream>
#include <utility>

#include "simulator/files.h"
#include "simulator/transcript.h"
#include "tests/support/manual_clock.h"
#include "tests/support/memory_stream.h"
#include "transport/connection.h"

template <typename Driver, typename SimulatedReceiver, typename Connection>
struct SimulatedDriver {
  // `link`: what the connection takes besides the receiver.
  template <typename Options, typename... Link>
  SimulatedDriver(const Options& options, sim::FileStore files, Link... link)
      : receiver(options, std::move(files), &transcript),
        connection(new Connection(receiver, link...)),
        driver(std::unique_ptr<CIConnection>(connection)) {}

  ManualClock clock;
  std::ostringstream log;
  sim::Transcript transcript{log};
  SimulatedReceiver receiver;
  Connection* connection;  // the driver's
  Driver driver;
  MemoryStream stream;
};

#endif  // RCVLINK_TESTS_SUPPORT_SIMULATED_DRIVER_H_
