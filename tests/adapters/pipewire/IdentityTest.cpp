// SPDX-License-Identifier: Apache-2.0
#include "adapters/pipewire/core/Identity.h"

#include <gtest/gtest.h>

namespace tarn::streams {

namespace {

const FieldValue* find(const BeginSession& begin, std::string_view key) {
  for (const Field& field : begin.configuration) {
    if (field.key == key) return &field.value;
  }
  return nullptr;
}

}  // namespace

TEST(PipeWireIdentity, TheApplicationIsItsIdThenItsProgramThenTheNode) {
  const Properties node{{"node.name", "node"}};
  EXPECT_EQ(applicationOf({}, {}), "Unknown");
  EXPECT_EQ(applicationOf(node, {}), "node");
  EXPECT_EQ(applicationOf(node, {{"application.process.binary", "program"}}), "program");
  EXPECT_EQ(applicationOf({{"application.process.binary", "own"}}, {{"application.process.binary", "client's"}}),
            "own");
  EXPECT_EQ(applicationOf({{"application.process.binary", "own"}}, {{"application.id", "org.example.Id"}}),
            "org.example.Id");
  EXPECT_EQ(applicationOf({{"application.id", ""}, {"node.name", "node"}}, {}), "node");
}

TEST(PipeWireIdentity, ASessionTellsProcessAndPortal) {
  const Properties node{{"media.class", "Stream/Output/Audio"},
                        {"node.name", "ALSA plug-in"},
                        {"media.role", "Game"},
                        {"media.name", "secret title"},
                        {"node.latency", "1024/48000"}};
  const Properties client{{"application.process.binary", "oxgame"},
                          {"application.process.id", "4711"},
                          {"pipewire.sec.pid", "2"},
                          {"pipewire.access.portal.app_id", "org.example.Game"}};
  const BeginSession begin = sessionOf(9, node, client, Rules{});
  EXPECT_EQ(begin.stream, 9U);
  EXPECT_EQ(begin.serviceType, 8U);
  EXPECT_EQ(begin.application, "oxgame");
  EXPECT_EQ(*find(begin, "application_process_id"), FieldValue(std::int64_t{4711}));
  EXPECT_EQ(*find(begin, "portal_app_id"), FieldValue(std::string("org.example.Game")));
  EXPECT_EQ(*find(begin, "media_role"), FieldValue(std::string("Game")));
  EXPECT_EQ(*find(begin, "media_class"), FieldValue(std::string("Stream/Output/Audio")));
  EXPECT_EQ(*find(begin, "stream_node"), FieldValue(std::string("ALSA plug-in")));
  EXPECT_EQ(*find(begin, "requested_latency"), FieldValue(std::string("1024/48000")));
}

TEST(PipeWireIdentity, ATitleIsToldOnlyWhenAskedFor) {
  const Properties node{{"media.name", "secret title"}, {"node.name", "player"}};
  Rules rules;
  EXPECT_EQ(find(sessionOf(1, node, {}, rules), "media_name"), nullptr);
  for (const Field& field : sessionOf(1, node, {}, rules).configuration) {
    EXPECT_NE(field.value, FieldValue(std::string("secret title"))) << field.key;
  }
  rules.mediaNames = true;
  EXPECT_EQ(*find(sessionOf(1, node, {}, rules), "media_name"), FieldValue(std::string("secret title")));
}

TEST(PipeWireIdentity, TheProcessIsThatOfTheSocketWhereNobodyTellsAnother) {
  EXPECT_EQ(*find(sessionOf(1, {}, {{"pipewire.sec.pid", "12"}}, {}), "application_process_id"),
            FieldValue(std::int64_t{12}));
  EXPECT_EQ(find(sessionOf(1, {}, {{"application.process.id", "none"}}, {}), "application_process_id"), nullptr);
}

TEST(PipeWireIdentity, ATextHasABoundAndIsNeverCutInACharacter) {
  const std::string text = std::string(1023, 'x') + "\xc3\xa9";
  EXPECT_EQ(applicationOf({{"node.name", text}}, {}), std::string(1023, 'x'));
  EXPECT_EQ(applicationOf({{"node.name", std::string(1022, 'x') + "\xc3\xa9"}}, {}).size(), 1024U);
}

TEST(PipeWireIdentity, AHardwareAddressIsAShortNumberThatStaysTheSame) {
  const std::string hidden = withoutAddress("bluez_output.AA_BB_CC_DD_EE_FF.1");
  EXPECT_EQ(hidden.size(), std::string("bluez_output.1234.1").size());
  EXPECT_EQ(hidden.substr(0, 13), "bluez_output.");
  EXPECT_EQ(hidden, withoutAddress("bluez_output.AA_BB_CC_DD_EE_FF.1"));
  EXPECT_NE(hidden, withoutAddress("bluez_output.AA_BB_CC_DD_EE_FE.1"));
  EXPECT_EQ(withoutAddress("aa:bb:cc:dd:ee:ff").size(), 4U);
}

TEST(PipeWireIdentity, OtherNamesStayAsTheyAre) {
  for (const std::string_view name : {"alsa_output.pci-0000_00_1f.3.analog-stereo", "speaker", "", "AA_BB_CC_DD_EE",
                                      "AA_BB_CC_DD_EE:FF", "alsa_output.usb-Oxbow_Box_00_11_22-00.iec958"}) {
    EXPECT_EQ(withoutAddress(name), name);
  }
}

}  // namespace tarn::streams
