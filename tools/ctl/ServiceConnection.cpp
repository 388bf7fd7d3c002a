#include "tools/ctl/ServiceConnection.h"

#include "tools/ctl/ExitStatus.h"
#include "tools/ctl/Output.h"

namespace tarn::ctl {

Answer askService(const std::string& socketPath, const client::Request& request) {
  // As long as the longest wait of a worker that blocks the service, and some more.
  constexpr std::chrono::minutes kPatience{4};
  Answer answer;
  if (!isNamed(socketPath, "--socket")) {
    answer.status = kWrongUsage;
    return answer;
  }
  const auto connected = client::ClientConnection::connect(socketPath);
  if (connected.failed()) {
    complain("the service can't be reached: " + connected.error->text);
    answer.status = kUnreachable;
    return answer;
  }
  answer.reply = connected.value->call(request, kPatience);
  switch (answer.reply.outcome) {
    case client::Outcome::Ok:
      break;
    case client::Outcome::Error:
      complain("the service answered with an error: " + printable(answer.reply.error.domain) + " " +
               std::to_string(answer.reply.error.code) + " " + printable(answer.reply.error.text));
      answer.status = kFailure;
      break;
    default:
      complain("no answer from the service at " + socketPath + ": " + answer.reply.error.text);
      answer.status = kUnreachable;
      break;
  }
  return answer;
}

}  // namespace tarn::ctl
