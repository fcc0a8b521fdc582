"""The build backend's wheel, packed around the module this build made: what pip checks
when it installs it, what it removes again on uninstall, and that it imports from there."""

import base64
import csv
import hashlib
import os
import subprocess
import sys
import sysconfig
import tomllib
import zipfile
from pathlib import Path

import pytest

import maroset

ROOT = Path(__file__).resolve().parents[2]
sys.path.insert(0, str(ROOT / "python" / "build_backend"))
import maroset_build  # noqa: E402

USE = """
import maroset
host = maroset.ClsNodeDBInterface()
seen = []
host.ValueChange.connect(lambda handles, count, values: seen.append((handles, values)))
host.nodeDB.AddNode("Mem", "MEMTAG")
host.nodeDB.getNode("Mem").AddTag(7, "Level")
host.nodeDB.getNode("Mem").WriteTag("7", 12.5)
maroset.run_for(0.01)
assert seen == [([7], [12.5])], seen
print(maroset.__file__)
"""


@pytest.fixture(scope="module")
def wheel(tmp_path_factory):
    out = tmp_path_factory.mktemp("wheel")
    return out / maroset_build.pack_wheel(ROOT, out, Path(maroset._maroset.__file__))


def test_record_lists_every_file_with_its_digest_and_size(wheel):
    with zipfile.ZipFile(wheel) as whl:
        names = whl.namelist()
        record_name = next(n for n in names if n.endswith(".dist-info/RECORD"))
        rows = list(csv.reader(whl.read(record_name).decode().splitlines()))
        assert sorted(row[0] for row in rows) == sorted(names)
        for name, digest, size in rows:
            if name == record_name:
                assert digest == size == ""
                continue
            data = whl.read(name)
            expected = base64.urlsafe_b64encode(hashlib.sha256(data).digest()).rstrip(b"=")
            assert digest == "sha256=" + expected.decode() and int(size) == len(data), name


def test_wheel_holds_the_package_and_metadata_of_pyproject(wheel):
    with open(ROOT / "pyproject.toml", "rb") as f:
        project = tomllib.load(f)["project"]
    source = ROOT / "python" / "maroset"
    expected = {f"maroset/{p.name}" for p in source.iterdir() if p.suffix in (".py", ".pyi")}
    expected |= {"maroset/py.typed", f"maroset/_maroset{sysconfig.get_config_var('EXT_SUFFIX')}"}
    dist_info = f"maroset-{project['version']}.dist-info"
    with zipfile.ZipFile(wheel) as whl:
        names = set(whl.namelist())
        metadata = whl.read(f"{dist_info}/METADATA").decode()
        wheel_file = whl.read(f"{dist_info}/WHEEL").decode()
    assert names - expected == {f"{dist_info}/{n}" for n in ("METADATA", "WHEEL", "RECORD")}
    assert expected <= names
    assert f"Name: {project['name']}\nVersion: {project['version']}\n" in metadata
    assert "Root-Is-Purelib: false\n" in wheel_file
    assert f"Tag: {wheel.stem.split('-', 2)[2]}\n" in wheel_file


def test_pip_installs_it_in_a_venv_and_uninstalls_it_all(wheel, tmp_path):
    subprocess.run([sys.executable, "-m", "venv", "--system-site-packages",
                    str(tmp_path / "venv")], check=True)
    python = str(tmp_path / "venv" / "bin" / "python")
    env = {k: v for k, v in os.environ.items() if k != "PYTHONPATH"}

    def run(*args):
        return subprocess.run([python, *args], cwd=tmp_path, env=env, check=True,
                              capture_output=True, text=True).stdout

    # pip refuses a wheel whose tag this interpreter does not support.
    run("-m", "pip", "install", "--no-index", "--no-deps", str(wheel))
    site = Path(run("-c", "import sysconfig; print(sysconfig.get_path('platlib'))").strip())
    assert Path(run("-c", USE).strip()).parent == site / "maroset"
    run("-m", "pip", "uninstall", "-y", "maroset")
    assert not list(site.glob("maroset*"))
