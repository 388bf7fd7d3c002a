// SPDX-License-Identifier: Apache-2.0
// tarnreportingctl report as scripts see it: exit statuses, what it prints, and what becomes of the page's file.
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>

#include "tests/e2e/support/PseudoTerminal.h"
#include "tests/e2e/support/ServiceFixture.h"
#include "tests/report/StoreFile.h"

namespace tarn::e2e {
namespace {

class ReportCommand : public ServiceFixture {
 protected:
  // tarnreportingctl on the made-up file.
  Process::Setup setup(std::vector<std::string> words) const {
    words.insert(words.begin(), {TARNREPORTINGCTL, "--state-dir", file_.folder()});
    Process::Setup setup;
    setup.words = std::move(words);
    return setup;
  }
  Finished onFile(std::vector<std::string> words) { return runToEnd(setup(std::move(words)), directory_); }
  static bool isPage(const std::string& text) {
    return text.starts_with("<!DOCTYPE html>") && text.ends_with("</html>\n");
  }
  static std::size_t filesIn(const std::string& folder) {
    return static_cast<std::size_t>(std::distance(std::filesystem::directory_iterator(folder), {}));
  }

  testing::StoreFile file_;
};

TEST_F(ReportCommand, PrintsThePageOrReplacesAFile) {
  file_.session(1, 0, "100");
  const Finished printed = onFile({"report", "1"});
  EXPECT_EQ(printed.status, 0) << printed.complaints;
  EXPECT_EQ(printed.complaints, "");
  EXPECT_TRUE(isPage(printed.output));
  const std::string path = directory_ / "pages/page.html";
  writeFile(path, "what was there before");
  const Finished written = onFile({"report", "1", "-o", path});
  EXPECT_EQ(written.status, 0) << written.complaints;
  EXPECT_EQ(written.output, "");
  EXPECT_TRUE(isPage(contentOf(path)));
  EXPECT_EQ(filesIn(directory_ / "pages"), 1U);
}

TEST_F(ReportCommand, WritesToWhatIsNoFileAsItIs) {
  file_.session(1, 0, "100");
  const std::string pipe = directory_ / "pipe";
  ASSERT_EQ(::mkfifo(pipe.c_str(), 0600), 0);
  const int reader = ::open(pipe.c_str(), O_RDWR | O_CLOEXEC);
  const Finished finished = onFile({"report", "1", "-o", pipe});
  EXPECT_EQ(finished.status, 0) << finished.complaints;
  std::string begun(15, '\0');
  EXPECT_EQ(::read(reader, begun.data(), begun.size()), 15);
  EXPECT_EQ(begun, "<!DOCTYPE html>");
  ::close(reader);
  struct stat status {};
  ASSERT_EQ(::stat(pipe.c_str(), &status), 0);
  EXPECT_TRUE(S_ISFIFO(status.st_mode));
}

TEST_F(ReportCommand, SaysWhatIsWrong) {
  file_.session(1, 0, "100");
  EXPECT_NE(onFile({"report", "7"}).complaints.find("there is no session 7"), std::string::npos);
  EXPECT_EQ(onFile({"report", "7"}).status, 1);
  for (const std::vector<std::string>& words : {std::vector<std::string>{"report", "seven"},
                                                {"report", "0"},
                                                {"report", "-1"},
                                                {"report", "--since", "soon"},
                                                {"report", "--since", "today", "--until", "yesterday"},
                                                {"report", "-o"},
                                                {"report", "--format", "pdf"}}) {
    const Finished finished = onFile(words);
    EXPECT_EQ(finished.status, 64) << words.back();
    EXPECT_EQ(finished.output, "") << words.back();
  }
  const Finished nothing = ctl({"report"});
  EXPECT_EQ(nothing.status, 1);
  EXPECT_NE(nothing.complaints.find(state()), std::string::npos) << nothing.complaints;
}

TEST_F(ReportCommand, LeavesNothingWhereItCanNotWrite) {
  file_.session(1, 0, "100");
  const std::string none = directory_ / "none/page.html";
  const Finished lost = onFile({"report", "1", "-o", none});
  EXPECT_EQ(lost.status, 1);
  EXPECT_NE(lost.complaints.find(none), std::string::npos) << lost.complaints;
  EXPECT_NE(lost.complaints.find("No such file or directory"), std::string::npos) << lost.complaints;
  const std::string folder = directory_ / "pages";
  std::filesystem::create_directory(folder);
  const Finished onFolder = onFile({"report", "1", "-o", folder});
  EXPECT_EQ(onFolder.status, 1);
  EXPECT_NE(onFolder.complaints.find(folder), std::string::npos) << onFolder.complaints;
  EXPECT_EQ(filesIn(folder), 0U);
  const Finished full = onFile({"report", "1", "-o", "/dev/full"});
  EXPECT_EQ(full.status, 1);
  EXPECT_NE(full.complaints.find("/dev/full: No space left on device"), std::string::npos) << full.complaints;
}

TEST_F(ReportCommand, OfADamagedFileIsNoPage) {
  const std::string folder = directory_ / "damaged";
  writeFile(folder + "/recorder.sqlite3", std::string(100'000, 'x'));
  const std::string path = directory_ / "page.html";
  writeFile(path, "what was there before");
  Process::Setup damaged;
  damaged.words = {TARNREPORTINGCTL, "--state-dir", folder, "report", "-o", path};
  const Finished finished = runToEnd(damaged, directory_);
  EXPECT_EQ(finished.status, 1);
  EXPECT_TRUE(finished.complaints.starts_with("tarnreportingctl: " + folder + "/recorder.sqlite3: "))
      << finished.complaints;
  EXPECT_EQ(contentOf(path), "what was there before");
}

TEST_F(ReportCommand, OfNoSessionsIsAPage) {
  const Finished finished = onFile({"report"});
  EXPECT_EQ(finished.status, 0) << finished.complaints;
  EXPECT_TRUE(isPage(finished.output));
  EXPECT_NE(finished.output.find(": 0 sessions."), std::string::npos);
}

TEST_F(ReportCommand, DoesNotPrintAPageOnATerminal) {
  file_.session(1, 0, "100");
  PseudoTerminal terminal(80, 24);
  Process::Setup onTerminal = setup({"report", "1"});
  onTerminal.outputFd = terminal.fd();
  const Finished finished = runToEnd(onTerminal, directory_);
  EXPECT_EQ(finished.status, 64);
  EXPECT_NE(finished.complaints.find("-o"), std::string::npos) << finished.complaints;
  EXPECT_EQ(terminal.written(), "");
}

// The file is held for as long as it takes to be told of, so the reading waits.
TEST_F(ReportCommand, TellsATerminalOfLongWork) {
  file_.session(1, 0, "100");
  file_.sql("BEGIN EXCLUSIVE");
  PseudoTerminal terminal(80, 24);
  Process::Setup onTerminal = setup({"report", "1"});
  onTerminal.words.insert(onTerminal.words.begin(),
                          {"/bin/sh", "-c", "TERM=xterm exec \"$0\" \"$@\" 2>" + terminal.name()});
  Process process(onTerminal, directory_);
  EXPECT_TRUE(eventually([&] { return terminal.written().find("reading the sessions, ") != std::string::npos; }))
      << terminal.written();
  file_.sql("COMMIT");
  EXPECT_TRUE(process.wait());
  EXPECT_NE(terminal.written().find(" s\r\x1b[K"), std::string::npos) << terminal.written();
}

}  // namespace
}  // namespace tarn::e2e
