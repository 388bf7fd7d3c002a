// SPDX-License-Identifier: Apache-2.0
// A folder of the test's own with the kernel's texts on one sound card, which has a loudspeaker (PCH:pcm0p), a
// microphone (PCH:pcm0c) and a screen (PCH:pcm3p), as they were recorded from a machine; and on processes.
#pragma once

#include <gtest/gtest.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <string>

namespace tarn::streams {

class KernelTexts : public testing::Test {
 protected:
  KernelTexts() {
    std::string folder = (std::filesystem::temp_directory_path() / "tarnalsaXXXXXX").string();
    root = ::mkdtemp(folder.data());
    std::filesystem::copy(std::string(ALSA_TESTDATA) + "/playing", root + "/asound",
                          std::filesystem::copy_options::recursive);
    addProcess("1841", "1840", "oxplay");
    addProcess("1842", "1842", "oxrecord");
  }
  ~KernelTexts() override { std::filesystem::remove_all(root); }

  void write(const std::string& path, const std::string& text) const {
    std::filesystem::create_directories(std::filesystem::path(root + "/" + path).parent_path());
    std::ofstream(root + "/" + path, std::ios::binary) << text;
  }
  void writeStatus(const std::string& pcm, const std::string& text) const {
    write("asound/card0/" + pcm + "/sub0/status", text);
  }
  // A thread, the process that it is of, and the name that this tells.
  void addProcess(const std::string& thread, const std::string& process, const std::string& name) const {
    write(thread + "/status",
          "Name:\tworker\nUmask:\t0022\nState:\tS (sleeping)\nTgid:\t" + process + "\nPid:\t" + thread + "\n");
    write(process + "/comm", name + "\n");
  }

  std::string root;
};

}  // namespace tarn::streams
