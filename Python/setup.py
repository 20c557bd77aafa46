"""The part of the build that pyproject.toml can't say: the extension, and the entry points, which CMake installs, too."""

import pathlib
import shlex
import subprocess

from setuptools import Extension, setup


def ask_pkg_config(option: str) -> list[str]:
    return shlex.split(subprocess.check_output(["pkg-config", option, "zarvo"], text=True))


setup(
    entry_points=pathlib.Path("entry_points.txt").read_text(encoding="utf-8"),
    ext_modules=[
        Extension(
            "zarvo._native",
            sorted(str(path) for path in pathlib.Path("Native").glob("*.cpp")),
            define_macros=[("Py_LIMITED_API", "0x030B0000"), ("PY_SSIZE_T_CLEAN", None)],
            extra_compile_args=["-std=c++20", "-fvisibility=hidden", *ask_pkg_config("--cflags")],
            extra_link_args=ask_pkg_config("--libs"),
            py_limited_api=True,
        )
    ],
    options={"bdist_wheel": {"py_limited_api": "cp311"}},
)
