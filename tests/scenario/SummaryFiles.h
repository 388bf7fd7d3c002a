// SummaryFiles: the files that sessions leave for people, set against the messages that the recorder holds.
#pragma once

#include <string>
#include <vector>

#include "tests/scenario/Model.h"
#include "tests/scenario/Recorded.h"

namespace tarn::scenario {

class SummaryFiles {
 public:
  // Finds the files below the service's state directory. Throws std::runtime_error when they can't be read.
  explicit SummaryFiles(const std::string& stateDirectory);

  // Each file must be that of one stop: its name tells the session, and after the markers of start and stop it holds
  // the messages of the period in the order of their stamps, then what the service made at the stop, each as the
  // recorder has it.
  void compare(const std::vector<Expectation>& expectations, const std::vector<RecordedEvent>& events);
  const std::vector<std::string>& differences() const { return differences_; }

  // Shows to stdout where they are and how they begin.
  void print() const;

 private:
  struct File {
    std::string path;
    std::string name;
    std::string content;
    bool isClaimed = false;
  };
  using Messages = std::vector<const RecordedEvent*>;
  void compareFile(const File& file, const ExpectedFile& expected, Messages messages);

  std::vector<File> files_;  // by name, so those of one session are in the order of its stops
  std::vector<std::string> differences_;
};

}  // namespace tarn::scenario
