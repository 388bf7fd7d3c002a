// SPDX-License-Identifier: Apache-2.0
#include "tests/e2e/support/ServiceFixture.h"

#include <csignal>

#include "plist/formats/Json.h"
#include "recorder/store/reading/EventReader.h"

namespace tarn::e2e {

ServiceFixture::~ServiceFixture() {
  if (HasFailure() && service_) {
    std::cerr << "the service logged:\n" << serviceLog();
  }
}

Process::Setup ServiceFixture::serviceSetup(const std::vector<std::string>& options) const {
  Process::Setup setup;
  setup.words = {TARNREPORTINGD, "--state-dir", state()};
  setup.words.insert(setup.words.end(), options.begin(), options.end());
  return setup;
}

bool ServiceFixture::startService(const std::vector<std::string>& options) {
  std::vector<std::string> all = {"--socket", socket()};
  all.insert(all.end(), options.begin(), options.end());
  service_ = std::make_unique<Process>(serviceSetup(all), directory_);
  // The socket takes connections before the service is set up; only an answer tells that it is.
  const auto answers = [this] {
    const auto connected = client::ClientConnection::connect(socket());
    return !service_->isRunning() || (connected.ok() && connected.value->call(client::status(), kDeadline).ok());
  };
  return eventually(answers) && service_->isRunning();
}

Finished ServiceFixture::runService(const std::vector<std::string>& options) {
  return runToEnd(serviceSetup(options), directory_);
}

int ServiceFixture::stopService(int signal) {
  service_->signal(signal);
  return service_->wait().value_or(-1);
}

bool ServiceFixture::logSays(const std::string& text) const {
  return serviceLog().find(text) != std::string::npos;
}

bool ServiceFixture::logWillSay(const std::string& text) const {
  return eventually([&] { return logSays(text); });
}

std::unique_ptr<Process> ServiceFixture::startCtl(const std::vector<std::string>& words, const std::string& input,
                                                  int outputFd) {
  Process::Setup setup;
  setup.words = {TARNREPORTINGCTL, "--socket", socket(), "--state-dir", state()};
  setup.words.insert(setup.words.end(), words.begin(), words.end());
  setup.input = input;
  setup.outputFd = outputFd;
  return std::make_unique<Process>(setup, directory_);
}

Finished ServiceFixture::ctl(const std::vector<std::string>& words, const std::string& input) {
  const auto process = startCtl(words, input);
  const auto status = process->wait();
  return {status.value_or(-1), process->output(), process->complaints()};
}

std::vector<json> ServiceFixture::play(const std::string& script) {
  const Finished played = ctl({"run"}, script);
  EXPECT_EQ(played.status, 0) << played.complaints;
  return jsonLines(played.output);
}

std::unique_ptr<client::ClientConnection> ServiceFixture::connect() {
  auto connected = client::ClientConnection::connect(socket());
  EXPECT_TRUE(connected.ok()) << connected.error.text();
  return std::move(connected.value);
}

std::vector<Event> ServiceFixture::events(const std::string& nameGlob) {
  std::vector<Event> found;
  recorder::EventReader reader(state() + "/recorder.sqlite3");
  recorder::EventQuery query;
  query.nameGlob = nameGlob;
  Result<recorder::EventPage> page;
  do {
    page = reader.read(query);
    EXPECT_TRUE(page.ok()) << page.error.text();
    for (const auto& row : page.value.rows) {
      found.push_back({row.id, row.backend, row.name, json::parse(row.payload), json::parse(row.detail)});
    }
    query.after = page.value.lookedUpTo;
  } while (page.value.more);
  return found;
}

std::vector<Event> ServiceFixture::eventsOnceThereAre(std::size_t count, const std::string& nameGlob) {
  std::vector<Event> found;
  eventually([&] {
    found = events(nameGlob);
    return found.size() >= count;
  });
  return found;
}

std::vector<std::string> ServiceFixture::names(const std::vector<Event>& events) const {
  std::vector<std::string> all;
  for (const Event& event : events) {
    all.push_back(event.name);
  }
  return all;
}

json ServiceFixture::status() {
  const auto client = connect();
  const client::Reply reply = client->call(client::status());
  EXPECT_TRUE(reply.ok()) << reply.error.text;
  std::string text;
  plist::appendJson(text, reply.dictionary());
  return json::parse(text);
}

json ServiceFixture::ledgerAtRest() {
  json ledger;
  EXPECT_TRUE(eventually([&] {
    ledger = status();
    return ledger.at("queued") == 0 && ledger.at("recorder_waiting") == 0;
  })) << ledger.dump();
  return ledger;
}

json replyTo(const std::vector<json>& replies, std::size_t line) {
  for (const json& reply : replies) {
    if (reply.at("line") == line) return reply;
  }
  return {};
}

}  // namespace tarn::e2e
