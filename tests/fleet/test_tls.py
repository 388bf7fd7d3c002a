# SPDX-License-Identifier: Apache-2.0
"""tarnreporting-export and a server that know each other by certificates, and what is told when they don't."""

import os
import shutil
import ssl
import subprocess
import sys
import tempfile
import unittest

sys.path.insert(0, os.path.dirname(os.path.abspath(__file__)))
import nats  # noqa: E402
from exporting import Device, eventually  # noqa: E402

EXPORT = os.environ["EXPORT"]
LONG_AGO = ("20200101000000Z", "20200201000000Z")
PRESENT = ("20200101000000Z", "20991231000000Z")
REFUSED = "tarnreporting-export: messages aren't taken: "


class Authority:
    """Makes certificates, with the openssl program."""

    def __init__(self, folder):
        self.folder = folder
        self.write("index", "")
        self.write("serial", "01\n")
        self.write("ca.cnf", f"[ca]\ndefault_ca = here\n[here]\ndatabase = {folder}/index\nserial = {folder}/serial\n"
                   f"new_certs_dir = {folder}\ndefault_md = sha256\npolicy = any\ncopy_extensions = copy\n"
                   f"unique_subject = no\n[any]\ncommonName = supplied\n")
        self.openssl("req", "-x509", "-newkey", "ec", "-pkeyopt", "ec_paramgen_curve:P-256", "-nodes", "-subj",
                     "/CN=authority", "-days", "3650", "-keyout", self.at("authority.key"), "-out",
                     self.at("authority.pem"))

    def at(self, name):
        return os.path.join(self.folder, name)

    def write(self, name, text):
        with open(self.at(name), "w", encoding="utf-8") as file:
            file.write(text)

    def openssl(self, *words):
        done = subprocess.run(["openssl", *words], capture_output=True, text=True, check=False)
        if done.returncode != 0:
            raise RuntimeError(done.stderr)

    def make(self, name, valid=PRESENT):
        """NAME.pem and NAME.key, for a server on this machine as for a device."""
        self.openssl("req", "-newkey", "ec", "-pkeyopt", "ec_paramgen_curve:P-256", "-nodes", "-subj", f"/CN={name}",
                     "-addext", "subjectAltName=DNS:localhost,IP:127.0.0.1", "-keyout", self.at(name + ".key"), "-out",
                     self.at(name + ".csr"))
        self.openssl("ca", "-batch", "-config", self.at("ca.cnf"), "-cert", self.at("authority.pem"), "-keyfile",
                     self.at("authority.key"), "-in", self.at(name + ".csr"), "-out", self.at(name + ".pem"),
                     "-startdate", valid[0], "-enddate", valid[1], "-notext")


@unittest.skipUnless(nats.PROGRAM, "nats-server is not installed here")
@unittest.skipUnless(shutil.which("openssl"), "openssl is not installed here")
class Tls(unittest.TestCase):
    @classmethod
    def setUpClass(cls):
        cls.made = tempfile.mkdtemp(prefix="tarntls")
        cls.addClassCleanup(shutil.rmtree, cls.made, True)
        cls.authority = Authority(cls.made)
        for name in ("server", "device", "reader"):
            cls.authority.make(name)
        for name in ("old-server", "old-device"):
            cls.authority.make(name, LONG_AGO)

    def setUp(self):
        self.folder = tempfile.mkdtemp(prefix="tarntls")
        self.addCleanup(shutil.rmtree, self.folder, True)
        self.device = Device(EXPORT, os.path.join(self.folder, "device"))
        self.addCleanup(self.device.close)
        self.device.record(100)

    def serve(self, certificate="server"):
        tls = ssl.create_default_context(cafile=self.authority.at("authority.pem"))
        tls.load_cert_chain(self.authority.at("reader.pem"), self.authority.at("reader.key"))
        if certificate != "server":
            tls.check_hostname, tls.verify_mode = False, ssl.CERT_NONE
        at = self.authority.at
        self.server = nats.Server(self.folder, f"tls {{ cert_file: \"{at(certificate + '.pem')}\", key_file: "
                                  f"\"{at(certificate + '.key')}\", ca_file: \"{at('authority.pem')}\", verify: true, "
                                  "timeout: 5 }", tls)
        self.addCleanup(self.server.end)
        self.server.start()
        with self.server.client() as client:
            client.make_stream()

    def start(self, certificate="device"):
        at = self.authority.at
        own = ""
        if certificate:
            own = (f"certificate_file = \"{at(certificate + '.pem')}\"\ncertificate_key_file = "
                   f"\"{at(certificate + '.key')}\"\n")
        self.device.configure(f"urls = \"tls://localhost:{self.server.port}\"\n"
                              f"authority_file = \"{at('authority.pem')}\"\n{own}")
        return self.device.start()

    def told(self):
        """What it said of a refusal, once it has: one line, and no second one of the same."""
        self.assertTrue(eventually(lambda: REFUSED in self.device.logged()), self.device.logged())
        [line] = self.device.logged().splitlines()
        self.assertEqual(self.device.cursor(), 0)
        return line

    def test_by_their_certificates_they_know_each_other(self):
        self.serve()
        self.start()
        self.assertTrue(eventually(lambda: self.device.cursor() == 100), self.device.logged())

    def test_a_device_without_a_certificate_or_with_an_expired_one_is_told(self):
        self.serve()
        for certificate in ("", "old-device"):
            process = self.start(certificate)
            self.assertIn("the server hung up on the greeting", self.told())
            process.kill()
            process.wait()
            os.unlink(self.device.log)

    def test_a_server_whose_certificate_expired_is_not_trusted(self):
        self.serve("old-server")
        self.start()
        self.assertIn("certificate has expired", self.told())

    def test_a_certificate_that_was_renewed_in_its_place_is_taken_without_a_restart(self):
        self.serve()
        for kind in ("pem", "key"):
            shutil.copy(self.authority.at("old-device." + kind), self.authority.at("renewed." + kind))
        self.start("renewed")
        self.told()
        for kind in ("pem", "key"):
            shutil.copy(self.authority.at("device." + kind), self.authority.at("renewed." + kind))
        self.assertTrue(eventually(lambda: self.device.cursor() == 100), self.device.logged())
        self.assertIn("messages are taken again", self.device.logged())


if __name__ == "__main__":
    unittest.main(argv=sys.argv[:1])
