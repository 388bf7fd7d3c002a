// SPDX-License-Identifier: Apache-2.0
// A book with a player, its client and two sinks, and what it says as lines of a script.
#pragma once

#include <gtest/gtest.h>

#include <string>
#include <utility>
#include <variant>
#include <vector>

#include "adapters/pipewire/ActionScript.h"
#include "adapters/pipewire/core/StreamBook.h"

namespace tarn::streams {

class StreamBookFixture : public testing::Test {
 protected:
  static constexpr Moment kSecond = 1'000'000'000;
  static constexpr ObjectId kClient = 30;
  static constexpr ObjectId kPlayer = 40;
  static constexpr ObjectId kSpeaker = 50;
  static constexpr ObjectId kHeadset = 51;

  static Moment at(double seconds) { return static_cast<Moment>(seconds * 1e9); }
  static NodeFacts nodeOf(NodeState state, Properties properties) { return {state, {}, std::move(properties)}; }
  static Properties playerProperties() {
    return {
        {"media.class", "Stream/Output/Audio"}, {"node.name", "player"}, {"client.id", "30"}, {"media.role", "Music"}};
  }
  static VolumeFacts volumeOf(float channel) { return {1.0F, false, false, {channel, channel}, {channel, channel}}; }

  // What was said since the last call, with the sessions' beginnings only when asked for.
  std::vector<PostMessage> said() {
    std::vector<PostMessage> posts;
    for (const Action& action : book.take()) {
      if (const PostMessage* const post = std::get_if<PostMessage>(&action)) {
        posts.push_back(*post);
      }
    }
    return posts;
  }
  static std::string textOfField(const PostMessage& post, std::string_view key) {
    for (const Field& field : post.fields) {
      if (field.key != key) continue;
      if (const auto* const text = std::get_if<std::string>(&field.value)) return *text;
      if (const auto* const flag = std::get_if<bool>(&field.value)) return *flag ? "true" : "false";
      if (const auto* const whole = std::get_if<std::int64_t>(&field.value)) return std::to_string(*whole);
      return factorTextOf(std::get<double>(field.value));
    }
    return "(none)";
  }
  static std::string factorTextOf(double number) {
    std::string text = std::to_string(number);
    text.erase(text.find_last_not_of('0') + 1);
    return text;
  }
  // "Playback Start", as the script calls it.
  static std::string nameOf(const PostMessage& post) {
    const std::string line = scriptOf(Action(post));
    const auto between = [&line](std::string_view key) {
      const std::size_t from = line.find(key) + key.size();
      return line.substr(from, line.find('"', from) - from);
    };
    return between("\"category\": \"") + " " + between("\"type\": \"");
  }
  static std::vector<std::string> namesOf(const std::vector<PostMessage>& posts) {
    std::vector<std::string> names;
    for (const PostMessage& post : posts) {
      names.push_back(nameOf(post));
    }
    return names;
  }

  void addSinks() {
    book.nodeKnown(kSpeaker, 1, nodeOf(NodeState::Idle, {{"media.class", "Audio/Sink"}, {"node.name", "speaker"}}));
    book.nodeKnown(kHeadset, 1, nodeOf(NodeState::Idle, {{"media.class", "Audio/Sink"}, {"node.name", "headset"}}));
  }
  // The player, linked to the speaker at half of the slider.
  void addPlayer(Moment when) {
    book.clientKnown(kClient, {{"application.process.binary", "oxplay"}});
    book.nodeKnown(kPlayer, when, nodeOf(NodeState::Idle, playerProperties()));
    book.volumesKnown(kPlayer, when, volumeOf(0.125F));
    book.formatKnown(kPlayer, when, FormatFacts{"S16LE", 48000, 2});
    book.linkKnown(60, when, {kPlayer, kSpeaker, false, {}});
    book.settle();
  }
  void run(Moment when) {
    book.nodeKnown(kPlayer, when, nodeOf(NodeState::Running, playerProperties()));
    book.settle();
  }
  void pause(Moment when) {
    book.nodeKnown(kPlayer, when, nodeOf(NodeState::Idle, playerProperties()));
    book.settle();
  }

  StreamBook book{Rules{}};
};

}  // namespace tarn::streams
