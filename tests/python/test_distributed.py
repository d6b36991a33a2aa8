# OCR of a batch on a two-worker LocalCluster: a run stopped halfway and run again
# writes every input once in each format, redoes none, and reports the input that
# cannot be read.
import json
import shutil
import time

import pytest

distributed = pytest.importorskip("distributed")

import corvelbase
from corvelbase.distributed import ocr_many
from conftest import DOCUMENTS, OCR

OPTIONS = {"languages": ["en-US"], "level": "fast"}
FORMATS = ("txt", "hocr")


class Stop(Exception):
    pass


def executing(dask_worker):
    return len(dask_worker.state.executing)


@pytest.fixture(scope="module")
def client():
    with distributed.LocalCluster(n_workers=2, threads_per_worker=1, processes=True,
                                  dashboard_address=None) as cluster, \
            distributed.Client(cluster) as client:
        yield client


def test_a_stopped_run_finishes_on_the_next_without_redoing_pages(client, tmp_path):
    pages = []
    for name in ["sample", "one-column", "two-columns", "french", "german", "photographed"]:
        pages.append(tmp_path / f"{name}.png")
        shutil.copy(OCR / f"{name}.png", pages[-1])
    pages.append(tmp_path / "pages.tif")  # a document of two pages
    shutil.copy(DOCUMENTS / "pages.tif", pages[-1])
    broken = tmp_path / "broken.png"
    broken.write_bytes(b"\x89PNG\r\n\x1a\n and nothing more")
    out = tmp_path / "out"

    seen = []

    def stop_after_two(outcome):
        seen.append(outcome)
        if len([o for o in seen if o.status == "done"]) == 2:
            raise Stop

    with pytest.raises(Stop):
        ocr_many(pages + [broken], out, client, on_page=stop_after_two, formats=FORMATS,
                 **OPTIONS)
    # Pages already running when the run stopped still land; wait for them.
    while any(client.run(executing).values()):
        time.sleep(0.1)
    first = {p.name: (p.stat().st_ino, p.stat().st_mtime_ns) for p in out.glob("*.*")
             if p.suffix != ".json"}
    assert 2 <= len(first) // len(FORMATS) < len(pages)

    report = ocr_many(pages + [broken], out, client, formats=FORMATS, **OPTIONS)

    written_first = {p for p in pages if f"{p.stem}.txt" in first}
    assert set(map(str, written_first)) == set(report.skipped)
    assert set(map(str, pages)) - set(map(str, written_first)) == set(report.done)
    for name, identity in first.items():  # untouched: not rewritten by the second run
        stat = (out / name).stat()
        assert (stat.st_ino, stat.st_mtime_ns) == identity
    for page in pages:  # every input in every format, as this process reads it
        result = corvelbase.ocr(page, **OPTIONS)
        for format in FORMATS:
            assert (out / f"{page.stem}.{format}").read_text() == corvelbase.render(result, format)
    failure, = report.failed
    assert (failure.path, failure.code) == (str(broken),
                                            corvelbase._corvelbase.ERROR_DOCUMENT_UNREADABLE)
    errors = json.loads((out / "broken.error.json").read_text())["errors"]
    assert [error["reason"] for error in errors] == [failure.reason]
    assert not list(out.glob(".*"))  # no temporary file left behind


def test_inputs_with_one_name_do_not_overwrite_each_other(client, tmp_path):
    (tmp_path / "a").mkdir()
    (tmp_path / "b").mkdir()
    first, second = tmp_path / "a" / "page.png", tmp_path / "b" / "page.png"
    shutil.copy(OCR / "one-column.png", first)
    shutil.copy(OCR / "french.png", second)
    report = ocr_many([first, second], tmp_path / "out", client, **OPTIONS)
    assert report.done == [str(first)] and [f.path for f in report.failed] == [str(second)]
