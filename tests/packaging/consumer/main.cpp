// SPDX-License-Identifier: Apache-2.0
// A stranger's program: finds the installed client library, makes requests with values of every kind, and is told that
// no service listens where none does.
#include <iostream>

#include <tarnkit/TarnReportingClient.h>

int main(int argumentCount, char** arguments) {
  if (argumentCount != 2) return 64;
  const tarnkit::Dictionary message{{"volume", 0.5},
                                    {"at", tarnkit::Date{12.5}},
                                    {"list", tarnkit::Array{1, true, "text", tarnkit::Dictionary{{"a", 1}}}},
                                    {"bytes", tarnkit::Data{"abc"}}};
  const tarnkit::Request requests[] = {tarnkit::createReportingSession(42),
                                       tarnkit::setServiceType(7, 42),
                                       tarnkit::getServiceNameForReporterID(42),
                                       tarnkit::setConfiguration({{"HostApplicationDisplayID", "Music"}}, 42),
                                       tarnkit::startReportingSessionForID(42),
                                       tarnkit::sendMessage(message, 14, 16, std::vector<std::int64_t>{42}),
                                       tarnkit::stopReportingSessionForID(42),
                                       tarnkit::destroyReportingSession(42),
                                       tarnkit::reporterID(42),
                                       tarnkit::getAllReporters(),
                                       tarnkit::killService(),
                                       tarnkit::status()};
  const auto connected = tarnkit::TarnReportingClient::connect(arguments[1]);
  std::cout << connected.error << '\n';
  if (connected.client != nullptr) {
    for (const tarnkit::Request& request : requests) {
      connected.client->send(request, [](tarnkit::Reply&& reply) { std::cout << outcomeName(reply.outcome) << '\n'; });
    }
    return 1;
  }
  return connected.error.empty() ? 1 : 0;
}
