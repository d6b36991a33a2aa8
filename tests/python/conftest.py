# pytest set-up for the Python module: `make test` runs these against the package in the
# build tree (python/CMakeLists.txt sets the environment read here).
import os
from pathlib import Path

import pytest

FIXTURES = Path(os.environ.get("CORVEL_FIXTURES_DIR",
                               Path(__file__).resolve().parents[1] / "fixtures"))
OCR = FIXTURES / "ocr"
DOCUMENTS = FIXTURES / "documents"


@pytest.fixture(scope="session")
def corvel_tool():
    tool = os.environ.get("CORVEL_TOOL_PATH")
    if not tool:
        pytest.skip("CORVEL_TOOL_PATH is not set (run through ctest)")
    return tool
