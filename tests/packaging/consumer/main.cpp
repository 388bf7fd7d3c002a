// A stranger's program: finds the installed client library and is told that no service listens where none does.
#include <iostream>

#include "client/TarnReportingClient.h"

int main(int argumentCount, char** arguments) {
  if (argumentCount != 2) return 64;
  const auto connected = tarn::client::TarnReportingClient::connect(arguments[1]);
  std::cout << connected.error << '\n';
  return connected.client == nullptr && !connected.error.empty() ? 0 : 1;
}
