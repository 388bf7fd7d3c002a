// SPDX-License-Identifier: Apache-2.0
// Messages whose shape nobody declared, where no service answers: what the call refuses, and what is remembered.
#include <string>
#include <vector>

#include "tests/clients/LibraryFixture.h"
#include "tests/host/ScratchFolder.h"

namespace tarn::reporting {
namespace {

class PostingFields : public LibraryFixture {
 protected:
  PostingFields() { openAll(folder_.file("nobody")); }

  int postFields(const std::vector<tarnreporting_field>& fields, std::uint32_t type = 1) {
    const tarnreporting_message_options options = {sizeof options, 4, type, fields.data(), fields.size(), 0};
    return tarnreporting_post_fields(writer_, session_, &options);
  }
  int postKey(const std::string& key) { return postFields({{key.c_str(), tarnreporting_integer(1)}}); }

  testing::ScratchFolder folder_;
};

TEST_F(PostingFields, TakesEachKindWithoutAShape) {
  EXPECT_EQ(postFields({{"integer", tarnreporting_integer(-1)},
                        {"unsigned", tarnreporting_unsigned(UINT64_MAX)},
                        {"double", tarnreporting_double(0.5)},
                        {"date", tarnreporting_date(1.7e9)},
                        {"boolean", tarnreporting_boolean(1)},
                        {"text", text("\xC3\xA4")}}),
            TARNREPORTING_OK);
  EXPECT_EQ(postFields({}), TARNREPORTING_OK);
  EXPECT_EQ(state().posted, 2U);
}

TEST_F(PostingFields, RefusesWhatIsWrongAtTheCall) {
  const std::string longKey(256, 'a');
  const std::string longText(1025, 'a');
  tarnreporting_value odd = tarnreporting_integer(1);
  odd.kind = 99;
  const std::pair<std::vector<tarnreporting_field>, int> rows[] = {
      {{{"a", tarnreporting_integer(1)}, {"a", tarnreporting_double(1)}}, TARNREPORTING_ARGUMENT},
      {{{nullptr, tarnreporting_integer(1)}}, TARNREPORTING_ARGUMENT},
      {{{"", tarnreporting_integer(1)}}, TARNREPORTING_ARGUMENT},
      {{{"a", tarnreporting_text(nullptr, 1)}}, TARNREPORTING_ARGUMENT},
      {{{"a", odd}}, TARNREPORTING_KIND},
      {{{"\xFF", tarnreporting_integer(1)}}, TARNREPORTING_TEXT},
      {{{"a", text("\xFF")}}, TARNREPORTING_TEXT},
      {{{longKey.c_str(), tarnreporting_integer(1)}}, TARNREPORTING_TOO_LARGE},
      {{{"a", text(longText)}}, TARNREPORTING_TOO_LARGE}};
  for (const auto& [fields, result] : rows) {
    EXPECT_EQ(postFields(fields), result) << fields.front().key;
  }
  EXPECT_EQ(postFields({}, 65536), TARNREPORTING_ARGUMENT);
  EXPECT_EQ(state().posted, 0U);
}

TEST_F(PostingFields, AMessageHas64KeysAndNotMore) {
  std::vector<std::string> names;
  for (int i = 0; i < 65; ++i) {
    names.push_back("key" + std::to_string(i));
  }
  std::vector<tarnreporting_field> fields;
  for (const std::string& name : names) {
    fields.push_back({name.c_str(), tarnreporting_integer(1)});
  }
  EXPECT_EQ(postFields(fields), TARNREPORTING_TOO_LARGE);
  fields.pop_back();
  EXPECT_EQ(postFields(fields), TARNREPORTING_OK);
}

TEST_F(PostingFields, NullPointersAreAnError) {
  const tarnreporting_message_options options = {sizeof options, 4, 1, nullptr, 1, 0};
  EXPECT_EQ(tarnreporting_post_fields(writer_, session_, &options), TARNREPORTING_ARGUMENT);
  EXPECT_EQ(tarnreporting_post_fields(nullptr, session_, &options), TARNREPORTING_ARGUMENT);
  EXPECT_EQ(tarnreporting_post_fields(writer_, nullptr, &options), TARNREPORTING_ARGUMENT);
  EXPECT_EQ(tarnreporting_post_fields(writer_, session_, nullptr), TARNREPORTING_ARGUMENT);
}

TEST_F(PostingFields, TheSameKeysAndKindsTakeOneShape) {
  for (int i = 0; i < 2000; ++i) {
    ASSERT_EQ(postKey("key"), TARNREPORTING_OK);
  }
  // All but the fixture's shape and the one of the key are left.
  for (int i = 0; i < 1022; ++i) {
    declareShape();
  }
  EXPECT_EQ(postKey("other"), TARNREPORTING_TOO_LARGE);
  EXPECT_EQ(postKey("key"), TARNREPORTING_OK);
}

TEST_F(PostingFields, ASessionRemembers64SetsWhoseMessagesWait) {
  for (int i = 0; i < TARNREPORTING_MOST_FIELD_SETS; ++i) {
    ASSERT_EQ(postKey("key" + std::to_string(i)), TARNREPORTING_OK) << i;
  }
  EXPECT_EQ(postKey("one more"), TARNREPORTING_TOO_LARGE);
  EXPECT_EQ(postKey("key0"), TARNREPORTING_OK);
}

TEST_F(PostingFields, AWriterAndASessionOfDifferentClientsDoNotGoTogether) {
  tarnreporting_client* const first = client_;
  tarnreporting_session* session = session_;
  openAll(folder_.file("nobody"));
  std::swap(session, session_);
  EXPECT_EQ(postKey("key"), TARNREPORTING_ARGUMENT);
  tarnreporting_client_close(first, 0, nullptr);
}

}  // namespace
}  // namespace tarn::reporting
