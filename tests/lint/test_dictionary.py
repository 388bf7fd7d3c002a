# SPDX-License-Identifier: Apache-2.0
"""Tests of tools/lint/dictionary.py and of the table that it reads: each rule passes what is right and reports what is
wrong, and where."""

import os
import sys
import unittest

HERE = os.path.dirname(os.path.abspath(__file__))
sys.path.insert(0, os.path.join(HERE, "..", "..", "tools", "lint"))

import dictionary  # noqa: E402
from generate import made  # noqa: E402
from table import PATH, Fault, load, pascal, upper  # noqa: E402
from tree import Tree  # noqa: E402

WORKER = "derived/TarnReportingSessionVolumeMessagesWorker.cpp"
TABLE = """
category = [{number = 1, name = "Generic", text = "Any."}]
domain = [{number = 0x04000000, name = "MIDI", text = "MIDI."}]
type = [{number = 0, name = "Generic", text = "Any."}]
service = [{number = 0, name = "generic", enumerator = "Generic", text = "Any."}]

[[part]]
name = "TarnReportingSessionVolumeMessagesWorker"
text = "Volume."
files = ["derived/TarnReportingSessionVolumeMessagesWorker.cpp"]

[[key]]
name = "volume"
section = "Volume"
kind = "number"
unit = "scalar"
range = [0, 1]
readers = ["TarnReportingSessionVolumeMessagesWorker"]
text = "The volume."

[[key]]
name = "play_seconds"
section = "Volume"
kind = "number"
writers = ["TarnReportingSessionVolumeMessagesWorker"]
text = "How long."

[[derived]]
category = "Generic"
type = "Generic"
by = "TarnReportingSessionVolumeMessagesWorker"
when = "at the stop"
text = "Volume."
keys = ["play_seconds"]

[derived.example]
text = "One."
script = '''
{"op": "getAllReporters"}
'''
recorded = '''
{"backend": "tally", "name": "x", "payload": {"play_seconds": 1}}
'''

[[report]]
name = "volume changed"
category = "Generic"
type = "Generic"
text = "It is so loud."
fields = [{key = "volume", argument = "volume"}]
"""
VOCABULARY = """
enum class AudioEventCategory : std::uint32_t {
  Generic = 1,
  DomainMIDI = 0x04000000,
};
enum class AudioEventType : std::uint16_t { Generic = 0 };
enum class AudioServiceType : std::uint16_t { Generic = 0 };
"""
SOURCE = 'const plist::Key kVolume("volume");\nvoid f() { d.set("play_seconds", 1); }\n'


def tree(table=TABLE, source=SOURCE):
    files = {PATH: table, WORKER: source, dictionary.VOCABULARY: VOCABULARY,
             dictionary.CLASSES: "makeTable<TarnReportingSessionVolumeMessagesWorker>();\n"}
    try:
        files.update(made(table))
    except Fault:
        pass
    return Tree(files)


def found(a_tree):
    return [(finding.path, finding.line, finding.text) for finding in dictionary.check(a_tree)]


class Code(unittest.TestCase):
    def expect_unknown(self, source, key, line=3):
        self.assertEqual(found(tree(source=SOURCE + source)), [(WORKER, line, f"{key} is no key of {PATH}")])

    def test_a_table_that_holds_what_the_code_names_is_fine(self):
        self.assertEqual(found(tree()), [])

    def test_what_an_adapter_says_is_in_the_table_by_its_constant_or_a_literal(self):
        adapter = dictionary.ADAPTERS + "StreamMessages.cpp"
        part = '[[part]]\nname = "Adapters"\ntext = "They."\nfiles = ["%s"]\n\n' % adapter
        muted = ('[[key]]\nname = "muted"\nsection = "Streams"\nkind = "boolean"\nwriters = ["Adapters"]\n'
                 'text = "It is."\n\n')
        table = TABLE.replace("[[derived]]", part + muted + "[[derived]]", 1)
        for source, wrong in (("fields.push_back({keys::kMuted, true});", None),
                              ('fields.push_back({"muted", true});', None),
                              ("keys::kMuted; addText(fields, keys::kLouder, text);", "Louder is no key of " + PATH),
                              ('keys::kMuted; addText(made.fields, "louder", text);', "louder is no key of " + PATH),
                              ('keys::kMuted; keys::kVolume;', f"no part that {PATH} names for volume has this file"),
                              ("nothing();", "no file of Adapters knows muted")):
            a_tree = tree(table)
            a_tree.files[adapter] = "\n" + source + "\n"
            texts = [text for _, _, text in found(a_tree)]
            self.assertEqual(texts, [wrong] if wrong else [], source)

    def test_a_missing_table_is_reported(self):
        self.assertEqual([finding[:2] for finding in found(Tree({WORKER: SOURCE}))], [(PATH, 1)])

    def test_a_declared_key_that_is_not_in_the_table_is_reported(self):
        self.expect_unknown('const plist::Key kNew("brand_new");\n', "brand_new")
        self.expect_unknown('struct K { plist::Key one{"brand_new"}; };\n', "brand_new")
        self.expect_unknown('const Keys kKeys{plist::Key("brand_new")};\n', "brand_new")

    def test_a_literal_in_an_operation_of_a_dictionary_is_a_key(self):
        for operation in ('d.set("brand_new", 1);', 'd->get("brand_new");', 'd.contains("brand_new");',
                          'd.remove("brand_new");', 'd["brand_new"].asInt64();'):
            self.expect_unknown(operation + "\n", "brand_new")

    def test_a_constant_in_an_operation_of_a_dictionary_is_a_key(self):
        self.expect_unknown('constexpr std::string_view kNew = "brand_new"; void g() { d.get(kNew); }\n', "brand_new")
        self.expect_unknown('constexpr const char* kNew = "brand_new"; void g() { d.set(kNew, 1); }\n', "brand_new")

    def test_a_member_of_a_dictionary_that_is_written_out_is_a_key(self):
        self.expect_unknown('auto d = plist::Dictionary{{"volume", 1},\n{"brand_new", 2}};\n', "brand_new", 4)
        self.expect_unknown('plist::Dictionary d{{"brand_new", 2}};\n', "brand_new")

    def test_a_setting_that_is_watched_is_a_key(self):
        self.expect_unknown('constexpr std::array<Feature, 1> kFeatures{{\n    {"brand_new", {}, "x"},\n}};\n',
                            "brand_new", 4)

    def test_a_prefix_that_is_asked_for_is_a_pattern(self):
        self.expect_unknown('constexpr std::string_view kNew = "bad_"; void g() { d.hasKeyWithPrefix(kNew); }\n',
                            "bad_*")

    def test_what_only_looks_like_a_key_is_none(self):
        self.assertEqual(found(tree(source=SOURCE + '// d.set("brand_new", 1);\nlog("brand_new");\n'
                                                    'constexpr std::string_view kText = "brand_new";\n')), [])

    def test_a_key_of_a_file_that_no_part_has_is_reported(self):
        other = tree()
        other.files["session/Other.cpp"] = 'const plist::Key kVolume("volume");\n'
        self.assertEqual(found(other),
                         [("session/Other.cpp", 1, f"no part that {PATH} names for volume has this file")])

    def test_a_key_that_no_file_of_its_part_knows_is_reported(self):
        texts = [text for _, _, text in found(tree(source='void f() { d.set("play_seconds", 1); }\n'))]
        self.assertEqual(texts, ["no file of TarnReportingSessionVolumeMessagesWorker knows volume"])

    def test_a_part_with_a_file_that_there_is_not_is_reported(self):
        table = TABLE.replace(f'["{WORKER}"]', f'["{WORKER}", "derived/No.cpp"]')
        self.assertEqual([text for _, _, text in found(tree(table))],
                         ["TarnReportingSessionVolumeMessagesWorker has a file that there isn't: derived/No.cpp"])

    def test_a_worker_class_that_is_no_part_is_reported(self):
        other = tree()
        other.files[dictionary.CLASSES] += "makeTable<TarnReportingSessionNewWorker>();\n"
        self.assertIn("no part TarnReportingSessionNewWorker", found(other)[0][2])

    def test_a_number_that_the_vocabulary_has_otherwise_is_reported(self):
        for before, after in (("Generic = 1", "Generic = 2"), ("DomainMIDI = 0x04", "DomainMIDI = 0x08"),
                              ("{ Generic = 0 }", "{ Generic = 0, Extra = 1 }")):
            other = tree()
            other.files[dictionary.VOCABULARY] = VOCABULARY.replace(before, after)
            self.assertTrue(found(other), after)

    def test_what_is_made_of_the_table_must_be_current(self):
        for path in made(TABLE):
            other = tree()
            other.files[path] += "\n"
            self.assertEqual([finding[0] for finding in found(other)], [path])
            del other.files[path]
            self.assertEqual([finding[0] for finding in found(other)], [path])


class Table(unittest.TestCase):
    def expect_fault(self, before, after, part):
        changed = TABLE.replace(before, after)
        self.assertNotEqual(changed, TABLE)
        with self.assertRaises(Fault) as raised:
            load(changed)
        self.assertIn(part, str(raised.exception))

    def test_a_fault_is_a_finding_at_its_entry(self):
        table = TABLE.replace('kind = "number"\nunit', 'kind = "numbr"\nunit')
        line = table.split("\n").index('name = "volume"') + 1
        self.assertEqual(found(tree(table)), [(PATH, line, "key volume: no kind is 'numbr'")])

    def test_what_is_wrong_in_the_table_is_told(self):
        self.expect_fault('kind = "number"\nunit', 'kindness = "number"\nunit', "key volume")
        self.expect_fault("[[part]]", "[[prt]]", "there is no such list")
        self.expect_fault('"play_seconds"\nsection', '"volume"\nsection', "key volume: stands twice")
        self.expect_fault("[0, 1]", "[1, 0]", "a range is")
        self.expect_fault('text = "The volume."', 'text = "The volume"', "no sentence")
        self.expect_fault('readers = ["TarnReportingSessionVolumeMessagesWorker"]', "readers = []", "nobody reads")
        self.expect_fault('readers = ["Tarn', 'readers = ["Torn', "there is no part Torn")
        self.expect_fault('unit = "scalar"', 'places = ["somewhere"]', "no place 'somewhere'")
        self.expect_fault('unit = "scalar"', 'only_in = ["Generic.Nothing"]', "there is no type Nothing")
        self.expect_fault('unit = "scalar"', 'only_in = ["Nothing.Generic"]', "there is no category Nothing")
        self.expect_fault('unit = "scalar"', 'values = ["loud"]', "only texts have values")
        self.expect_fault("= [{", "[{", "no TOML")

    def test_what_is_wrong_with_a_derived_message_is_told(self):
        self.expect_fault('keys = ["play_seconds"]', 'keys = ["volume", "play_seconds"]', "doesn't write volume")
        self.expect_fault('keys = ["play_seconds"]', 'keys = ["nothing"]', "there is no key nothing")
        self.expect_fault('[[derived]]', '[[key]]\nname = "msgidx"\nsection = "Volume"\nkind = "integer"\n'
                          'writers = ["TarnReportingSessionVolumeMessagesWorker"]\ntext = "One."\n\n[[derived]]',
                          "none of its messages has it")
        self.expect_fault('{"play_seconds": 1}', '{"play_second": 1}', "which isn't among its keys")
        self.expect_fault('{"op": "getAllReporters"}', '{"op": getAllReporters}', "no JSON")
        self.expect_fault('category = "Generic"\n', 'category = "Nothing"\n', "there is no category Nothing")

    def test_what_is_wrong_with_a_report_is_told(self):
        self.expect_fault('name = "volume changed"', 'name = "volumeChanged"', "its name isn't words")
        self.expect_fault('"It is so loud."', '"It is so loud"', "report volume changed: its text is no sentence")
        self.expect_fault('category = "Generic"\ntype = "Generic"\ntext', 'category = "No"\ntype = "Generic"\ntext',
                          "report volume changed: there is no category No")
        self.expect_fault('type = "Generic"\ntext = "It', 'type = "No"\ntext = "It', "there is no type No")
        field = 'fields = [{key = "volume", argument = "volume"}]'
        for after, part in (('{key = "no", argument = "volume"}', "there is no key no"),
                            ('{key = "volume"}', "has either a value or an argument"),
                            ('{key = "volume", is = 0.5, argument = "volume"}', "has either a value or an argument"),
                            ('{key = "volume", is = "loud"}', "isn't 'loud'"),
                            ('{key = "volume", argument = "the volume"}', "whose name is no word"),
                            ('{key = "volume", argument = "volume", hertz = true}', "is no text of Hz"),
                            ('{key = "volume", is = 0.5}, {key = "volume", is = 0.5}', "key volume stands twice"),
                            ('{key = "volume", loud = true}', "report volume changed")):
            self.expect_fault(field, f"fields = [{after}]", part)

    def test_a_report_becomes_a_function_in_each_language(self):
        files = made(TABLE)
        self.assertIn("tarnreporting_report_volume_changed(", files["clients/c/include/tarnreporting_reports.h"])
        self.assertIn("Result volumeChanged(Writer& writer, double volume, ",
                      files["clients/cpp/include/tarnreporting_reports.hpp"])
        self.assertIn("def volume_changed(self, volume: float, *, stamp: Optional[float] = None) -> bool:",
                      files["clients/python/tarnreporting/reports.py"])

    def test_names_are_cut_into_words(self):
        self.assertEqual([upper("mFormatID"), upper("vp_config_primary_vocoderFs"), upper("MIDIDriver"),
                          upper("spatial-audio-accessory-feature"), upper("vmInfo_phys_footprint_MiB")],
                         ["M_FORMAT_ID", "VP_CONFIG_PRIMARY_VOCODER_FS", "MIDI_DRIVER",
                          "SPATIAL_AUDIO_ACCESSORY_FEATURE", "VM_INFO_PHYS_FOOTPRINT_MIB"])
        self.assertEqual(pascal("session_output_running"), "SessionOutputRunning")

    def test_a_pattern_stands_for_names_with_some_text_in_place_of_each_star(self):
        key = load(TABLE).keys[0]
        pattern = type(key)(**{**vars(key), "name": "*_Simple_*"})
        self.assertTrue(pattern.stands_for("Foo_Simple_Bar"))
        self.assertFalse(pattern.stands_for("_Simple_"))
        self.assertFalse(pattern.stands_for("Foo_State_Bar"))


if __name__ == "__main__":
    unittest.main()
