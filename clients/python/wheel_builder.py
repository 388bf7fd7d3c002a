# SPDX-License-Identifier: Apache-2.0
"""Makes the wheel of this package with the standard library alone: `pip install ./clients/python` downloads nothing."""

import base64
import hashlib
import os
import tarfile
import zipfile

HERE = os.path.dirname(os.path.abspath(__file__))
NAME = "tarnreporting"
FIELDS = ("name", "version", "description", "requires-python")


def project():
    """What pyproject.toml says; read by hand, since Python 3.9 has no reader of TOML."""
    found = {}
    with open(os.path.join(HERE, "pyproject.toml"), encoding="utf-8") as file:
        for line in file:
            field, _, value = line.partition(" = ")
            if field in FIELDS:
                found[field] = value.strip().strip('"')
    return found


def metadata():
    said = project()
    return (f"Metadata-Version: 2.1\nName: {said['name']}\nVersion: {said['version']}\n"
            f"Summary: {said['description']}\nRequires-Python: {said['requires-python']}\n")


def information():
    """The files about the package: where, and what."""
    folder = f"{NAME}-{project()['version']}.dist-info"
    return {f"{folder}/METADATA": metadata(),
            f"{folder}/WHEEL": "Wheel-Version: 1.0\nGenerator: wheel_builder\nRoot-Is-Purelib: true\n"
                               "Tag: py3-none-any\n",
            f"{folder}/top_level.txt": NAME + "\n"}


def package_files():
    folder = os.path.join(HERE, NAME)
    return sorted(f"{NAME}/{name}" for name in os.listdir(folder) if name.endswith(".py") or name == "py.typed")


def build_wheel(wheel_directory, config_settings=None, metadata_directory=None):
    name = f"{NAME}-{project()['version']}-py3-none-any.whl"
    contents = {path: text.encode() for path, text in information().items()}
    for path in package_files():
        with open(os.path.join(HERE, path), "rb") as file:
            contents[path] = file.read()
    record = f"{NAME}-{project()['version']}.dist-info/RECORD"
    lines = []
    with zipfile.ZipFile(os.path.join(wheel_directory, name), "w", zipfile.ZIP_DEFLATED) as wheel:
        for path, content in contents.items():
            digest = base64.urlsafe_b64encode(hashlib.sha256(content).digest()).rstrip(b"=").decode()
            lines.append(f"{path},sha256={digest},{len(content)}")
            wheel.writestr(path, content)
        wheel.writestr(record, "\n".join([*lines, f"{record},,", ""]))
    return name


def build_sdist(sdist_directory, config_settings=None):
    base = f"{NAME}-{project()['version']}"
    with tarfile.open(os.path.join(sdist_directory, base + ".tar.gz"), "w:gz") as archive:
        for path in ["pyproject.toml", "wheel_builder.py", *package_files()]:
            archive.add(os.path.join(HERE, path), f"{base}/{path}")
    return base + ".tar.gz"


def prepare_metadata_for_build_wheel(metadata_directory, config_settings=None):
    for path, text in information().items():
        os.makedirs(os.path.join(metadata_directory, os.path.dirname(path)), exist_ok=True)
        with open(os.path.join(metadata_directory, path), "w", encoding="utf-8") as file:
            file.write(text)
    return f"{NAME}-{project()['version']}.dist-info"
