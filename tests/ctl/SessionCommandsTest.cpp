// SPDX-License-Identifier: Apache-2.0
// The commands about sessions as people run them: the program itself, on a file that SQL made.
#include <fcntl.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <fstream>
#include <nlohmann/json.hpp>
#include <sstream>

#include "tests/ctl/SessionStoreFixture.h"

namespace tarn::ctl {
namespace {

using nlohmann::json;

struct Finished {
  int status = -1;
  std::string output;
  std::string complaints;
};

class SessionCommandsTest : public testing::SessionStoreFixture {
 protected:
  std::string kept(const char* name) const { return (directory() / name).string(); }
  // Has a shell do that; its exit status, or -1.
  static int run(const std::string& command, int outputFd) {
    const pid_t child = ::fork();
    if (child == 0) {
      ::dup2(outputFd, STDOUT_FILENO);
      ::execl("/bin/sh", "sh", "-c", command.c_str(), nullptr);
      ::_exit(127);
    }
    int status = 0;
    ::waitpid(child, &status, 0);
    return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
  }
  // The program, after words such as "env A=B", with words of a shell.
  std::string commandOf(const std::string& before, const std::string& words) const {
    return "TZ=UTC0 COLUMNS= NO_COLOR= exec " + before + " '" + TARN_CTL + "' --state-dir '" + directory().string() +
           "' " + words + " 2>'" + kept("complaints") + "'";
  }
  Finished shell(const std::string& before, const std::string& words) {
    const int output = ::open(kept("output").c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0600);
    const int status = run(commandOf(before, words), output);
    ::close(output);
    return {status, contentOf(kept("output")), contentOf(kept("complaints"))};
  }
  // The exit status when nobody is there any more to read what is printed.
  int statusWithoutReader(const std::string& words) {
    std::array<int, 2> ends{};
    EXPECT_EQ(::pipe2(ends.data(), O_CLOEXEC), 0);
    ::close(ends[0]);
    const int status = run(commandOf("", words), ends[1]);
    ::close(ends[1]);
    return status;
  }
  Finished ctl(const std::string& words) { return shell("", words); }
  static std::string contentOf(const std::string& path) {
    std::ostringstream content;
    content << std::ifstream(path).rdbuf();
    return content.str();
  }
  static std::vector<json> lines(const std::string& text) {
    std::vector<json> all;
    std::istringstream in(text);
    for (std::string line; std::getline(in, line);) {
      all.push_back(json::parse(line));
    }
    return all;
  }
  // Two sessions: one of the music player's, that played for 30 s and had an overload, and one that is open.
  void makeTwo() {
    makeStore();
    Session music;
    music.id = 12;
    music.ended = kBegin + 40;
    music.endReason = "stopped";
    addSession(music);
    addMessage(12, kBegin + 1, "Setup.Setup",
               R"({"ringerstate":true,"last_updated":1.0,"tarnreporting_timestamp":)" + at(1));
    addMessage(12, kBegin + 2, "Playback.Start",
               R"({"session_output_running":true,"active_devices":"Speaker","KvSessionVolume":0.5,)"
               R"("HostApplicationDisplayID":"org.example.music","tarnreporting_timestamp":)" +
                   at(2));
    addMessage(12, kBegin + 20, "IO.Error", R"({"issue_type":"overload","tarnreporting_timestamp":)" + at(20));
    addMessage(12, kBegin + 32, "Playback.Stop",
               R"({"session_output_running":false,"tarnreporting_timestamp":)" + at(32));
    addMessage(12, kBegin + 40, "Volume.Summary",
               R"({"play_seconds":30.0,"KvSessionVolume":0.5,"active_devices":"Speaker","msgidx":1,"msgcnt":1,)"
               R"("session_selected_format":"unknown","HostApplicationDisplayID":"org.example.music",)"
               R"("tarnreporting_timestamp":)" +
                   at(40));
    addMessage(
        12, kBegin + 40, "Session_Generic.Summary",
        R"({"overload_count":1,"num_messages":6,"num_unique_messages":7,"total_active_time":0.0,"active_count":0,)"
        R"("average_active_time":0.0,"summaryServiceName":"longformaudio","thermal_state":"Nominal",)"
        R"("load_avg_1_min":0.5,"tarnreporting_timestamp":)" +
            at(40));
    addPeriod(12, kBegin, kBegin + 40, 1, lastEvent(), 6, 0);
    Session film;
    film.id = 13;
    film.process = "film";
    film.application = "org.example.film";
    film.created = kBegin + 3600;
    addSession(film);
    addEvent(0, kBegin + 3601, "tally", "sys.oxbow.tarnkit.tarnreportingclientuptime", "{}");
  }
  static std::string at(double seconds) { return std::to_string(kBegin + seconds) + "}"; }

  static constexpr double kBegin = 1795158000;  // 2026-11-20 07:00:00
};

TEST_F(SessionCommandsTest, SessionsAreALineEach) {
  makeTwo();
  const Finished listed = ctl("sessions --limit 1 --until '2026-11-20 07:30'");
  EXPECT_EQ(listed.status, 0) << listed.complaints;
  EXPECT_EQ(
      listed.output,
      "SESSION  CREATED              PROCESS  PID  APPLICATION        SERVICE        ACTIVE  OVERLOADS  END\n"
      "     12  2026-11-20 07:00:00  player   812  org.example.music  longformaudio  40.0 s          1  stopped\n");
  EXPECT_EQ(ctl("-q sessions --app '*.film'").output,
            "13  2026-11-20 08:00:00  film  812  org.example.film  longformaudio  0.0 s  0  open\n");
}

TEST_F(SessionCommandsTest, ThoseThatNeverRanBeforeTheyGotTheirTypeAreNotListed) {
  makeTwo();
  Session untyped;
  untyped.ended = kBegin + 1;
  untyped.endReason = "retyped";
  for (const std::int64_t id : {11, 20, 21}) {
    untyped.id = id;
    addSession(untyped);
  }
  addPeriod(20, kBegin, kBegin + 1);
  untyped.id = 22;
  untyped.endReason = "replaced";
  addSession(untyped);
  const auto ids = [this](const std::string& options) {
    std::string all;
    for (const json& each : lines(ctl("sessions --json " + options).output)) {
      all += std::to_string(each.at("id").get<int>()) + " ";
    }
    return all;
  };
  EXPECT_EQ(ids(""), "12 13 20 22 ");
  EXPECT_EQ(ids("--limit 2"), "20 22 ");
  EXPECT_EQ(ids("--all"), "11 12 13 20 21 22 ");
  EXPECT_EQ(ids("--all --limit 2"), "21 22 ");
}

TEST_F(SessionCommandsTest, SessionsAsJsonAreWhatTheQueryAsksFor) {
  makeTwo();
  const auto ids = [this](const std::string& options) {
    std::string all;
    for (const json& each : lines(ctl("sessions --json " + options).output)) {
      all += std::to_string(each.at("id").get<int>()) + " ";
    }
    return all;
  };
  EXPECT_EQ(ids(""), "12 13 ");
  EXPECT_EQ(ids("--open"), "13 ");
  EXPECT_EQ(ids("--app 'org.example.m*'"), "12 ");
  EXPECT_EQ(ids("--since @1795158041"), "13 ");
  EXPECT_EQ(ids("--since -1s"), "13 ");  // the other ended long before the first run of this test
  EXPECT_EQ(ids("--until 2026-11-20"), "");
  EXPECT_EQ(ids("--since '2026-11-20 07:00' --until '2026-11-20 08:00'"), "12 ");
  EXPECT_EQ(ids("--limit 1"), "13 ");
}

TEST_F(SessionCommandsTest, ShowTellsItOnOneScreen) {
  makeTwo();
  const Finished shown = ctl("show 12");
  EXPECT_EQ(shown.status, 0) << shown.complaints;
  EXPECT_EQ(shown.output,
            "session 12  stopped\n"
            "  client       player (pid 812, uid 1000), connection 3\n"
            "  application  org.example.music\n"
            "  service      longformaudio (7), reporter 4101\n"
            "  device       ringerstate 1\n"
            "  created      2026-11-20 07:00:00.000\n"
            "  ended        2026-11-20 07:00:40.000, stopped\n"
            "  active       40.0 s in 1 period, 6 messages, 0 of them repeated\n"
            "  run          1 of the service 0.1.0, from 2026-11-20 04:46:40.000\n"
            "\n"
            "timeline\n"
            "  2026-11-20 07:00:02.000  output runs, route Speaker, volume 0.5\n"
            "  2026-11-20 07:00:20.000  overload\n"
            "  2026-11-20 07:00:32.000  output stops\n"
            "\n"
            "segments\n"
            "  KIND            SECONDS  VOLUME  DEVICES  FORMAT   APPLICATION\n"
            "  Volume.Summary       30     0.5  Speaker  unknown  org.example.music\n"
            "\n"
            "issues\n"
            "  1            overload IO.Error\n"
            "\n"
            "summary\n"
            "  active       0 s in 0 messages, 0 s each\n"
            "  overloads    1\n"
            "  messages     6, 7 kept, markers included\n"
            "  machine      thermal state Nominal, load 0.5\n"
            "\n"
            "back-ends\n"
            "  events       rtc 6, tally 12\n"
            "  BACKEND  NAME                                             EVENTS\n"
            "  rtc      sendMessage                                           6\n"
            "  tally    sys.oxbow.longformaudio.IO.Error                      1\n"
            "  tally    sys.oxbow.longformaudio.Playback.Start                1\n"
            "  tally    sys.oxbow.longformaudio.Playback.Stop                 1\n"
            "  tally    sys.oxbow.longformaudio.Session_Generic.Summary       1\n"
            "  tally    sys.oxbow.longformaudio.Setup.Setup                   1\n"
            "  tally    sys.oxbow.longformaudio.Volume.Summary                1\n"
            "  tally    sys.oxbow.tarnkit.IO.Error                            1\n"
            "  tally    sys.oxbow.tarnkit.Playback.Start                      1\n"
            "  tally    sys.oxbow.tarnkit.Playback.Stop                       1\n"
            "  and 3 more (--json has all)\n");
}

TEST_F(SessionCommandsTest, ShowTellsTheMachineWhereTheRunSaysWhichItWas) {
  makeTwo();
  EXPECT_EQ(json::parse(ctl("show 12 --json").output).at("run").at("machine"), json::object());
  sql(R"(ALTER TABLE runs ADD COLUMN machine TEXT; UPDATE runs SET machine = '{"model":"Player 3","os_id":"debian"}';)");
  EXPECT_NE(ctl("show 12").output.find("\n  machine      model Player 3, os_id debian\n"), std::string::npos);
  EXPECT_EQ(json::parse(ctl("show 12 --json").output).at("run").at("machine"),
            json::parse(R"({"model":"Player 3","os_id":"debian"})"));
  sql("UPDATE runs SET machine = '{\"model';");
  EXPECT_EQ(json::parse(ctl("show 12 --json").output).at("run").at("machine"), json::object());
}

TEST_F(SessionCommandsTest, ShowAsJsonHasAllOfIt) {
  makeTwo();
  const json shown = json::parse(ctl("show 12 --json").output);
  EXPECT_EQ(shown.at("session").at("id"), 12);
  EXPECT_EQ(shown.at("session").at("overloads"), 1);
  EXPECT_EQ(shown.at("run").at("version"), "0.1.0");
  EXPECT_EQ(shown.at("device"), json::parse(R"({"ringerstate":true})"));
  EXPECT_EQ(shown.at("timeline").at("output"), json::parse(R"([{"from":1795158002.0,"to":1795158032.0}])"));
  EXPECT_EQ(shown.at("timeline").at("routes").at(0).at("devices"), "Speaker");
  EXPECT_EQ(shown.at("timeline").at("volumes"), json::parse(R"([{"at":1795158002.0,"volume":0.5}])"));
  EXPECT_EQ(shown.at("timeline").at("overloads").at(0).at("what"), "IO.Error");
  EXPECT_EQ(shown.at("segments").at(0).at("kind"), "Volume.Summary");
  EXPECT_EQ(shown.at("segments").at(0).at("payload").at("play_seconds"), 30.0);
  EXPECT_EQ(shown.at("issues"), json::parse(R"([{"what":"overload IO.Error","count":1}])"));
  EXPECT_EQ(shown.at("summary").at("num_messages"), 6);
  EXPECT_EQ(shown.at("backends").size(), 13U);
  EXPECT_TRUE(json::parse(ctl("show 13 --json").output).at("summary").is_null());
}

TEST_F(SessionCommandsTest, EventsAreNarrowedBySessionTimeAndNumber) {
  makeTwo();
  const auto count = [this](const std::string& options) {
    return lines(ctl("events --json " + options).output).size();
  };
  EXPECT_EQ(count(""), 19U);
  EXPECT_EQ(count("--session 12"), 18U);
  EXPECT_EQ(count("--session 12 --once"), 6U);
  EXPECT_EQ(count("--since '2026-11-20 07:00:20' --until '2026-11-20 07:00:40'"), 6U);
  EXPECT_EQ(count("--limit 4"), 4U);
  EXPECT_EQ(count("--limit 1500"), 19U);
  EXPECT_EQ(lines(ctl("events --json --limit 1 --after 4").output).at(0).at("id"), 5);
  EXPECT_EQ(lines(ctl("events --json --session 12").output).at(0).at("session"), 12);
  EXPECT_TRUE(lines(ctl("events --json --after 18").output).at(0).at("session").is_null());
}

TEST_F(SessionCommandsTest, FollowEndsWhenThereAreEnough) {
  makeTwo();
  const Finished followed = shell("timeout 20", "events --follow --json --limit 3");
  EXPECT_EQ(followed.status, 0);
  EXPECT_EQ(lines(followed.output).size(), 3U);
}

TEST_F(SessionCommandsTest, AFileWithoutSessionsPrintsItsEventsAsEver) {
  makeOldStore();
  sql("INSERT INTO events VALUES(1, 100, 'tally', 'a', '{}', '{}');");
  EXPECT_EQ(ctl("events --json").output,
            "{\"id\":1,\"time\":100.0,\"backend\":\"tally\",\"name\":\"a\",\"payload\":{},\"detail\":{}}\n");
  const std::string why = file().string() +
                          " has no sessions yet: it is of version 0, and a service that knows them "
                          "begins with them\n";
  const Finished refused = ctl("events --session 3");
  EXPECT_EQ(refused.status, 1);
  EXPECT_EQ(refused.complaints, "tarnreportingctl: " + why);
  EXPECT_EQ(ctl("sessions").complaints, "tarnreportingctl: can't list sessions: " + why);
  EXPECT_EQ(ctl("show 3").complaints, "tarnreportingctl: can't read session 3: " + why);
}

TEST_F(SessionCommandsTest, ExportAsJsonHasEveryEvent) {
  makeTwo();
  const Finished exported = ctl("export 12 --format json");
  EXPECT_EQ(exported.status, 0) << exported.complaints;
  const json whole = json::parse(exported.output);
  EXPECT_EQ(whole.at("session").at("id"), 12);
  ASSERT_EQ(whole.at("events").size(), 18U);
  EXPECT_EQ(whole.at("events").at(0).at("payload").at("ringerstate"), true);
  EXPECT_EQ(json::parse(ctl("export 13 --format json").output).at("events"), json::array());
}

TEST_F(SessionCommandsTest, ExportAsCsvHasEachMessage) {
  makeTwo();
  const Finished exported = ctl("export 12 --format csv");
  EXPECT_EQ(exported.status, 0) << exported.complaints;
  EXPECT_EQ(std::count(exported.output.begin(), exported.output.end(), '\n'), 7);
  EXPECT_TRUE(exported.output.starts_with("event,time,stamp,category,type,derived,ringerstate,last_updated,"));
  EXPECT_NE(exported.output.find("\n4,1795158002.0,1795158002.0,Playback,Start,false,"), std::string::npos);
}

TEST_F(SessionCommandsTest, ExportAsTraceIsOneObject) {
  makeTwo();
  const json trace = json::parse(ctl("export 12 --format trace").output);
  EXPECT_GE(trace.at("traceEvents").size(), 10U);
}

TEST_F(SessionCommandsTest, ExportAsScriptIsWhatLintTakes) {
  makeTwo();
  const Finished exported = ctl("export 12 --format script");
  EXPECT_EQ(exported.status, 0) << exported.complaints;
  std::string told;
  for (const json& line : lines(exported.output)) {
    told += line.at("op").get<std::string>() + " ";
  }
  EXPECT_EQ(told,
            "createReportingSession setServiceType startReportingSessionForID sendMessage setConfiguration sendMessage "
            "sendMessage sendMessage stopReportingSessionForID ");
  std::ofstream(kept("script")) << exported.output;
  const Finished linted = ctl("lint --own-keys '" + kept("script") + "'");
  // The settings of the device, which the service told the session, are messages there.
  EXPECT_EQ(linted.output, kept("script") +
                               ":4: no part reads the key \"last_updated\": the service writes it itself "
                               "(TarnReportingSessionSystemMonitorWorker)\n");
}

TEST_F(SessionCommandsTest, WhatIsNotThereIsToldWithItsStatus) {
  EXPECT_EQ(ctl("sessions").complaints,
            "tarnreportingctl: can't list sessions: " + file().string() + " is not there\n");
  EXPECT_EQ(ctl("sessions").status, 1);
  makeTwo();
  for (const char* command : {"show 14", "export 14 --format csv"}) {
    const Finished finished = ctl(command);
    EXPECT_EQ(finished.status, 1);
    EXPECT_EQ(finished.complaints, "tarnreportingctl: there is no session 14 (\"sessions\" lists them)\n");
    EXPECT_EQ(finished.output, "");
  }
}

TEST_F(SessionCommandsTest, WrongUsageEndsWith64AndOneLine) {
  makeTwo();
  for (const char* words :
       {"sessions --since noon", "sessions --until 2026-13-01", "sessions --since today --until yesterday",
        "sessions --limit 0", "sessions --limit x", "show", "show x", "show 0", "show 12 13", "export 12",
        "export 12 --format html", "export --format csv", "events --since 5", "events --session -1", "events --limit 0",
        "sessions --color blue"}) {
    const Finished finished = ctl(words);
    EXPECT_EQ(finished.status, 64) << words;
    EXPECT_EQ(finished.output, "") << words;
    EXPECT_TRUE(finished.complaints.starts_with("tarnreportingctl: ")) << words << ": " << finished.complaints;
    EXPECT_EQ(std::count(finished.complaints.begin(), finished.complaints.end(), '\n'), 1) << words;
  }
  EXPECT_NE(ctl("sessions --since noon").complaints.find("--since: \"noon\" is no time, expected"), std::string::npos);
}

TEST_F(SessionCommandsTest, ColoursAreForTerminalsOrWhoAsks) {
  makeTwo();
  EXPECT_EQ(ctl("sessions").output.find('\x1b'), std::string::npos);
  EXPECT_NE(ctl("sessions --color=always").output.find("\x1b[1mSESSION"), std::string::npos);
  EXPECT_NE(ctl("show 12 --color=always").output.find("\x1b[1msession 12"), std::string::npos);
  EXPECT_EQ(ctl("sessions --json --color=always").output.find('\x1b'), std::string::npos);
}

TEST_F(SessionCommandsTest, LinesAreNoWiderThanColumns) {
  makeTwo();
  std::istringstream listed(shell("env COLUMNS=90", "sessions").output);
  for (std::string line; std::getline(listed, line);) {
    EXPECT_LE(line.size(), 96U) << line;  // an ellipsis is three bytes
  }
  EXPECT_NE(shell("env COLUMNS=90", "sessions").output.find("\xe2\x80\xa6"), std::string::npos);
}

TEST_F(SessionCommandsTest, AReaderThatHasLeftIsNoFailure) {
  makeTwo();
  for (const char* words : {"events", "sessions", "show 12", "export 12 --format csv", "export 12 --format json"}) {
    EXPECT_EQ(statusWithoutReader(words), 0) << words;
    EXPECT_EQ(contentOf(kept("complaints")), "") << words;
  }
}

TEST_F(SessionCommandsTest, WhatOthersWroteCannotSteerATerminal) {
  makeStore();
  Session odd;
  odd.process = "a\x1b[2Jb\n";
  addSession(odd);
  const std::string table = ctl("sessions").output;
  EXPECT_NE(table.find("a\\u001b[2Jb\\u000a"), std::string::npos) << table;
  EXPECT_NE(ctl("show 1").output.find("a\\u001b[2Jb\\u000a"), std::string::npos);
}

}  // namespace
}  // namespace tarn::ctl
