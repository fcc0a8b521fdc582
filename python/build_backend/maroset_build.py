"""The package's build backend (PEP 517), on the standard library alone, so that
`pip install .` needs nothing from the network: it builds the extension with the project's
CMake and packs it with the pure-Python part into a wheel for the running interpreter.

Project metadata comes from [project] in pyproject.toml. The build tree stays in
build/wheel-<tag>/ so that installing again rebuilds only what changed; the config setting
`build-dir` (`pip install --config-settings build-dir=DIR`) puts it elsewhere."""

import base64
import csv
import hashlib
import io
import os
import re
import shutil
import subprocess
import sys
import sysconfig
import tarfile
import time
import tomllib
import zipfile
from pathlib import Path

PACKAGE = "maroset"
PACKAGE_FILES = ("*.py", "*.pyi", "py.typed")

# The [project] keys METADATA is made from; any other key stops the build rather than be
# left out of the package without a word.
KNOWN_KEYS = {"name", "version", "description", "readme", "requires-python", "classifiers"}


def _project(root):
    with open(root / "pyproject.toml", "rb") as f:
        project = tomllib.load(f)["project"]
    unknown = set(project) - KNOWN_KEYS
    if unknown:
        raise ValueError(f"pyproject.toml: the build backend does not handle [project] "
                         f"{', '.join(sorted(unknown))}")
    return project


def _dist_name(project):
    """The distribution's name as file names spell it (PEP 427: runs of -_. become _)."""
    return re.sub(r"[-_.]+", "_", project["name"]).lower()


def _dist_info(project):
    return f"{_dist_name(project)}-{project['version']}.dist-info"


def _metadata(root, project):
    lines = [
        "Metadata-Version: 2.1",
        f"Name: {project['name']}",
        f"Version: {project['version']}",
    ]
    if "description" in project:
        lines.append(f"Summary: {project['description']}")
    if "requires-python" in project:
        lines.append(f"Requires-Python: {project['requires-python']}")
    lines += [f"Classifier: {c}" for c in project.get("classifiers", ())]
    text = "\n".join(lines) + "\n"
    if "readme" in project:
        readme = project["readme"]
        content_type = "text/markdown" if readme.endswith(".md") else "text/plain"
        text += f"Description-Content-Type: {content_type}\n\n"
        text += (root / readme).read_text(encoding="utf-8")
    return text


def _tag():
    """The wheel tag of the running interpreter, which the extension is built for."""
    if sys.implementation.name != "cpython":
        raise RuntimeError(f"building for {sys.implementation.name} is not supported")
    python = f"cp{sys.version_info.major}{sys.version_info.minor}"
    platform = re.sub(r"[-.]", "_", sysconfig.get_platform())
    return f"{python}-{python}{sys.abiflags}-{platform}"


def _wheel_file(tag):
    return ("Wheel-Version: 1.0\n"
            "Generator: maroset_build\n"
            "Root-Is-Purelib: false\n"
            f"Tag: {tag}\n")


def _build_extension(root, build_dir):
    """Configures the project with only the binding, builds it and returns the module."""
    configure = [
        "cmake", "-S", str(root), "-B", str(build_dir),
        "-DCMAKE_BUILD_TYPE=Release",
        f"-DPython_EXECUTABLE={sys.executable}",
        "-DMAROSET_BUILD_TESTS=OFF", "-DMAROSET_BUILD_BENCH=OFF", "-DMAROSET_BUILD_CLI=OFF",
    ]
    # A tree keeps the generator it was made with.
    if not (build_dir / "CMakeCache.txt").exists() and shutil.which("ninja"):
        configure += ["-G", "Ninja"]
    subprocess.run(configure, check=True)
    jobs = os.environ.get("CMAKE_BUILD_PARALLEL_LEVEL", str(os.cpu_count() or 2))
    subprocess.run(["cmake", "--build", str(build_dir), "--target", "maroset_python",
                    "-j", jobs], check=True)
    # The suffix names this interpreter's ABI; a module left by another would not load.
    return build_dir / "python" / PACKAGE / f"_maroset{sysconfig.get_config_var('EXT_SUFFIX')}"


def _digest(data):
    return "sha256=" + base64.urlsafe_b64encode(hashlib.sha256(data).digest()).rstrip(b"=").decode()


def pack_wheel(root, wheel_directory, extension):
    """Writes the wheel of the package under python/ with `extension` as its compiled
    module and returns the wheel's file name."""
    project = _project(root)
    tag = _tag()
    dist_info = _dist_info(project)
    files = [(f"{PACKAGE}/{path.name}", path.read_bytes())
             for pattern in PACKAGE_FILES
             for path in sorted((root / "python" / PACKAGE).glob(pattern))]
    files.append((f"{PACKAGE}/{extension.name}", extension.read_bytes()))
    # The .dist-info comes last, RECORD last of all, as installers expect.
    files.append((f"{dist_info}/METADATA", _metadata(root, project).encode()))
    files.append((f"{dist_info}/WHEEL", _wheel_file(tag).encode()))
    record = io.StringIO()
    writer = csv.writer(record, lineterminator="\n")
    for name, data in files:
        writer.writerow((name, _digest(data), len(data)))
    writer.writerow((f"{dist_info}/RECORD", "", ""))
    files.append((f"{dist_info}/RECORD", record.getvalue().encode()))

    wheel_name = f"{_dist_name(project)}-{project['version']}-{tag}.whl"
    stamp = time.gmtime(int(os.environ.get("SOURCE_DATE_EPOCH", time.time())))[:6]
    with zipfile.ZipFile(Path(wheel_directory) / wheel_name, "w", zipfile.ZIP_DEFLATED) as whl:
        for name, data in files:
            info = zipfile.ZipInfo(name, date_time=stamp)
            info.external_attr = (0o755 if name.endswith(".so") else 0o644) << 16
            info.compress_type = zipfile.ZIP_DEFLATED
            whl.writestr(info, data)
    return wheel_name


# The hooks run with the project's root as the working directory.

def get_requires_for_build_wheel(config_settings=None):
    return []


def get_requires_for_build_sdist(config_settings=None):
    return []


def prepare_metadata_for_build_wheel(metadata_directory, config_settings=None):
    root = Path.cwd()
    project = _project(root)
    dist_info = Path(metadata_directory) / _dist_info(project)
    dist_info.mkdir(parents=True, exist_ok=True)
    (dist_info / "METADATA").write_text(_metadata(root, project), encoding="utf-8")
    (dist_info / "WHEEL").write_text(_wheel_file(_tag()), encoding="utf-8")
    return dist_info.name


def build_wheel(wheel_directory, config_settings=None, metadata_directory=None):
    root = Path.cwd()
    build_dir = (config_settings or {}).get("build-dir") or root / "build" / f"wheel-{_tag()}"
    extension = _build_extension(root, Path(build_dir).resolve())
    return pack_wheel(root, wheel_directory, extension)


def build_sdist(sdist_directory, config_settings=None):
    """A tar.gz of the files git tracks, under <name>-<version>/ with PKG-INFO."""
    root = Path.cwd()
    project = _project(root)
    base = f"{_dist_name(project)}-{project['version']}"
    tracked = subprocess.run(["git", "-C", str(root), "ls-files", "-z"], check=True,
                             capture_output=True).stdout.decode().split("\0")
    mtime = int(os.environ.get("SOURCE_DATE_EPOCH", time.time()))

    def normalized(info):
        info.uid = info.gid = 0
        info.uname = info.gname = ""
        info.mtime = mtime
        return info

    name = f"{base}.tar.gz"
    with tarfile.open(Path(sdist_directory) / name, "w:gz", format=tarfile.PAX_FORMAT) as tar:
        pkg_info = _metadata(root, project).encode()
        info = normalized(tarfile.TarInfo(f"{base}/PKG-INFO"))
        info.size = len(pkg_info)
        info.mode = 0o644
        tar.addfile(info, io.BytesIO(pkg_info))
        for path in sorted(p for p in tracked if p):
            tar.add(root / path, f"{base}/{path}", recursive=False, filter=normalized)
    return name
