"""The files of the tree, for the checks beside this one."""
import subprocess
from pathlib import Path

ROOT = Path(__file__).resolve().parents[2]


def tracked(*patterns):
    """The paths of git, and of new files, that match."""
    out = subprocess.run(["git", "ls-files", "-co", "--exclude-standard", "--", *patterns], cwd=ROOT,
                         check=True, capture_output=True, text=True).stdout
    return [f for f in out.splitlines() if (ROOT / f).exists()]


def is_test(path):
    return path.endswith("_test.cpp")


def lines_of(path):
    return (ROOT / path).read_text().splitlines()
