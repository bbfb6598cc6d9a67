"""The build of the tests on the generated copy of the sources."""

import shutil
import subprocess

from rewrite import Rewriter, reached_by_use


class BuildError(Exception):
    pass


def write_if_new(path, text):
    """Leaves a file alone that is up to date, so that it isn't compiled again."""
    content = text.encode("latin-1")
    path.parent.mkdir(parents=True, exist_ok=True)
    if not path.exists() or path.read_bytes() != content:
        path.write_bytes(content)


class Build:
    def __init__(self, root, files, jobs):
        self.root = root
        self.files = files
        self.jobs = jobs
        self.folder = root / "build" / "mutation"
        self.copy = self.folder / "copy"  # with src/ in it
        self.binaries = self.folder / "binaries"
        self.use = reached_by_use(files)
        listed = (root / "tests" / "mutation" / "executables.txt").read_text().splitlines()
        self.targets = [line for line in map(str.strip, listed) if line and not line.startswith("#")]

    def write(self):
        for places in self.files:
            self.write_file(places)
        known = {self.copy / places.source.path for places in self.files}
        for leftover in [path for path in self.copy.rglob("*") if path.is_file() and path not in known]:
            leftover.unlink()

    def write_file(self, places, rebuilt=None):
        write_if_new(self.copy / places.source.path, Rewriter(places, self.use, rebuilt).whole())

    def configure(self):
        launcher = shutil.which("ccache")
        self.run(["cmake", "-G", "Ninja", "-S", self.root, "-B", self.binaries,
                  f"-DCMAKE_PROJECT_INCLUDE={self.root}/tests/mutation/instrument.cmake", f"-DMUTATED_COPY={self.copy}",
                  "-DCMAKE_BUILD_TYPE=None", "-DCMAKE_CXX_FLAGS=-O0 -w -Wno-narrowing",
                  f"-DCMAKE_CXX_COMPILER_LAUNCHER={launcher or ''}"])

    def compile(self):
        self.run(["cmake", "--build", self.binaries, "--parallel", str(self.jobs), "--target", *self.targets])

    def compiles_with(self, places, mutant):
        """Compiles the one mutant in; False when the compiler doesn't take it."""
        self.write_file(places, rebuilt=mutant)
        try:
            self.compile()
        except BuildError:
            return False
        return True

    def executable(self, target):
        found = [path for path in self.binaries.rglob(target) if path.is_file()]
        if len(found) != 1:
            raise BuildError(f"{len(found)} files named {target}")
        return found[0]

    def run(self, command):
        result = subprocess.run([str(part) for part in command], stdout=subprocess.PIPE, stderr=subprocess.STDOUT,
                                text=True, errors="replace")
        if result.returncode != 0:
            raise BuildError(f"{result.stdout}\nfailed: {' '.join(map(str, command))}")
