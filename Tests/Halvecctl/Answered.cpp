// SPDX-License-Identifier: Apache-2.0
//
// One connect and one request, answered beside the running program.
#include "Tests/Halvecctl/Answered.h"

namespace program {

Exchange RunAnswered(std::vector<std::string> arguments, const fake::Bytes& reply,
                     const std::string& input) {
  fake::Service service;
  arguments.insert(arguments.begin(), {"--service", service.path(), "--timeout", "10"});
  Exchange exchange;
  fake::Beside helper([&] {
    const fake::Connection connection = fake::Accept(service.socket());
    exchange.request = fake::Receive(connection.privatePort.get()).bytes;
    fake::Send(connection.privatePort.get(), reply);
    // Stays until the program has gone, as the helper would.
    (void)fake::Receive(connection.clientPort.get());
  });
  exchange.outcome = RunProgram(arguments, input);
  helper.join();
  return exchange;
}

}  // namespace program
