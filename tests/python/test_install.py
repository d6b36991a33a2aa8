# `cmake --install` puts the package where the interpreter of that prefix looks, and the
# installed module finds the installed library on its own.
import os
import subprocess
import sys

import pytest


def test_installed_package_imports_from_the_prefix(tmp_path):
    build = os.environ.get("CORVEL_BUILD_DIR")
    if not build:
        pytest.skip("CORVEL_BUILD_DIR is not set (run through ctest)")
    subprocess.run(["cmake", "--install", build, "--prefix", str(tmp_path)], check=True,
                   capture_output=True)
    site = tmp_path / os.environ["CORVEL_PYTHON_INSTALL_DIR"]
    env = {k: v for k, v in os.environ.items() if k not in ("PYTHONPATH", "LD_LIBRARY_PATH")}
    out = subprocess.run(
        [sys.executable, "-c", "import corvelbase, corvelbase.distributed;"
         "print(corvelbase.__file__);"
         "print(corvelbase.markdown.set_header('Title', 1, (0, 0)).text)"],
        env={**env, "PYTHONPATH": str(site)}, cwd=tmp_path, check=True, capture_output=True,
        text=True)
    location, header = out.stdout.splitlines()
    assert location.startswith(str(site)) and header == "# "
    assert (site / "corvelbase" / "_corvelbase.pyi").exists()
