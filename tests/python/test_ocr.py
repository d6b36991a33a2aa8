# Recognition through the module: every kind of source gives the text the file gives,
# results carry the page's geometry and words, failures arrive as exceptions of their
# kind, and jobs run side by side and stop when cancelled.
import concurrent.futures
import difflib
import os
import resource
import subprocess
import threading
import time

import numpy
import pytest
from PIL import Image

import corvelbase
from corvelbase import _corvelbase as native
from conftest import DOCUMENTS, OCR

SAMPLE = OCR / "sample.png"


def similarity(a, b):
    return difflib.SequenceMatcher(None, a.split(), b.split()).ratio()


@pytest.fixture(scope="module")
def sample_text():
    return corvelbase.ocr(SAMPLE, languages="en-US").text


@pytest.fixture(scope="module")
def rgb():
    return numpy.asarray(Image.open(SAMPLE).convert("RGB"))


# Each source carries the same pixels, so each must read exactly as the file does.
@pytest.mark.parametrize("make", [
    lambda rgb: SAMPLE.as_uri(),
    lambda rgb: SAMPLE.read_bytes(),
    lambda rgb: memoryview(bytearray(SAMPLE.read_bytes())),
    lambda rgb: rgb,
    lambda rgb: numpy.dstack([rgb, numpy.full(rgb.shape[:2], 255, numpy.uint8)]),
    # Rows apart (a crop of a wider picture), read in place.
    lambda rgb: numpy.pad(rgb, ((0, 0), (0, 7), (0, 0)))[:, :rgb.shape[1]],
    # Each pixel's channels apart: packed into a copy first.
    lambda rgb: numpy.asfortranarray(rgb),
], ids=["file-url", "bytes", "bytearray-view", "rgb", "rgba", "row-padded", "fortran-order"])
def test_every_source_reads_as_the_file_does(make, rgb, sample_text):
    assert corvelbase.ocr(make(rgb), languages=["en-US"]).text == sample_text


def test_grey_pixels_read_like_the_file():
    grey = numpy.asarray(Image.open(SAMPLE).convert("L"))
    expected = (OCR / "sample.txt").read_text()
    assert similarity(corvelbase.ocr(grey, languages="en-US").text, expected) > 0.9


@pytest.mark.parametrize("layout, accepted", [
    ("row-padded", True), ("flipped", False), ("fortran", False), ("channels-apart", False)])
def test_pixels_are_read_in_place_only_when_rows_are_packed(rgb, layout, accepted):
    array = {"row-padded": numpy.pad(rgb, ((0, 0), (0, 3), (0, 0)))[:, :rgb.shape[1]],
             "flipped": rgb[::-1], "fortran": numpy.asfortranarray(rgb),
             "channels-apart": rgb[:, :, ::-1]}[layout]
    try:
        native.submit_pixels(array, native.JobOptions(), lambda *outcome: None).stop()
    except ValueError:
        assert not accepted
    else:
        assert accepted


def inside(inner, outer, slack=1e-9):
    return (outer.x - slack <= inner.x and inner.x + inner.width <= outer.x + outer.width + slack
            and outer.y - slack <= inner.y
            and inner.y + inner.height <= outer.y + outer.height + slack)


@pytest.mark.parametrize("order", ["layout", "engine", "rows"])
def test_results_carry_the_page_tree_in_reading_order(order):
    result = corvelbase.ocr(SAMPLE, languages="en-US", order=order)
    page, = result.pages
    assert page.size == Image.open(SAMPLE).size
    assert {block.level for top in page.blocks for block in top.walk()} == set(corvelbase.Level)
    # The lines, in order, are the text's lines, each holding its own words (lines the
    # layout analysis joined side by side hold the words of both).
    position = 0
    for line in page.lines:
        position = result.text.index(line.text, position)
        assert 0 < line.confidence <= 100
        left, top, right, bottom = line.box.to_pixels(*page.size)
        assert 0 <= left < right <= page.size[0] and 0 <= top < bottom <= page.size[1]
        assert [word.text for word in line.words] == line.text.split()
        assert all(inside(word.box, line.box) and 0 < word.confidence <= 100
                   for word in line.words)
    # The heading comes first and stands above every other line, in pixels too.
    heading, *rest = page.lines
    assert heading.text == "A Sample Page in Two Columns"
    assert all(heading.box.to_pixels(*page.size)[3] <= line.box.to_pixels(*page.size)[1]
               for line in rest)


def test_layout_analysis_of_the_lines_gives_the_job_its_text():
    result = corvelbase.ocr(SAMPLE, languages="en-US", order="layout")
    again = corvelbase.analyse_layout(
        (line.text, (line.box.x, line.box.y, line.box.width, line.box.height), line.confidence)
        for line in result.lines)
    assert again.text == result.text
    assert [b.text for b in again.blocks] == [b.text for b in result.pages[0].blocks]


def broken_engine(tmp_path):
    (tmp_path / "eng.traineddata").write_bytes(b"not a model")
    corvelbase.configure_engine(data_path=str(tmp_path))


def no_models(tmp_path):
    corvelbase.configure_engine(data_path=str(tmp_path))


def encrypted(tmp_path):
    path = tmp_path / "locked.pdf"
    subprocess.run(["qpdf", "--encrypt", "user", "owner", "256", "--", DOCUMENTS / "scan.pdf",
                    path], check=True)
    return path


def unwritable(tmp_path):
    # Read, then written where no folder is.
    corvelbase.ocr(SAMPLE, languages="en-US", level="fast").save(tmp_path / "none" / "a.txt")


RECOGNITION, OCR_DOMAIN, DOCUMENT = (native.RECOGNITION_DOMAIN, native.OCR_DOMAIN,
                                     native.DOCUMENT_DOMAIN)


# One row per kind of failure: what causes it, and the exception, domain and code.
@pytest.mark.parametrize("source, options, setup, kind, domain, code", [
    (b"\x89PNG\r\n\x1a\n but not really", {}, None, corvelbase.DocumentUnreadableError,
     DOCUMENT, native.ERROR_DOCUMENT_UNREADABLE),
    (OCR / "missing.png", {}, None, corvelbase.DocumentUnreadableError, DOCUMENT,
     native.ERROR_DOCUMENT_UNREADABLE),
    (b"%PDF-", {}, None, corvelbase.DocumentDamagedError, DOCUMENT, native.ERROR_DOCUMENT_DAMAGED),
    (encrypted, {}, None, corvelbase.DocumentEncryptedError, DOCUMENT,
     native.ERROR_DOCUMENT_ENCRYPTED),
    (numpy.zeros((0, 5), numpy.uint8), {}, None, corvelbase.ImageUnreadableError, RECOGNITION,
     native.ERROR_IMAGE_UNREADABLE),
    (SAMPLE, {"languages": ["xx-XX"]}, None, corvelbase.UnsupportedLanguageError, RECOGNITION,
     native.ERROR_UNSUPPORTED_LANGUAGE),
    (OCR / "pages" / "page-01.png", {"timeout": 0.05}, None, corvelbase.RecognitionTimeoutError,
     RECOGNITION, native.ERROR_TIMED_OUT),
    (SAMPLE, {"languages": "en-US"}, broken_engine, corvelbase.EngineError, RECOGNITION,
     native.ERROR_ENGINE_FAILURE),
    (SAMPLE, {}, no_models, corvelbase.UnsupportedSystemError, OCR_DOMAIN,
     native.ERROR_UNSUPPORTED_SYSTEM),
    (None, {}, unwritable, corvelbase.WriteError, DOCUMENT, native.ERROR_WRITE),
], ids=["undecodable-bytes", "missing-file", "damaged-pdf", "encrypted-pdf", "no-pixels",
        "language", "timeout", "engine", "no-recogniser", "unwritable-output"])
def test_each_failure_raises_its_kind(tmp_path, source, options, setup, kind, domain, code):
    try:
        with pytest.raises(kind) as raised:
            if setup:
                setup(tmp_path)
            if source is not None:
                corvelbase.ocr(source(tmp_path) if callable(source) else source, **options)
    finally:
        corvelbase.configure_engine()
    error = raised.value
    assert (error.domain, error.code) == (domain, code) and error.reason
    assert isinstance(error, corvelbase.Error)


@pytest.mark.parametrize("call, kind", [
    (lambda: corvelbase.ocr(3.5), TypeError),
    (lambda: corvelbase.ocr(numpy.zeros((4, 4), numpy.float32)), TypeError),
    (lambda: corvelbase.ocr(numpy.zeros((4, 4, 2), numpy.uint8)), ValueError),
    (lambda: corvelbase.ocr(SAMPLE, level="quick"), ValueError),
    (lambda: corvelbase.ocr(SAMPLE, order="columns"), ValueError),
    (lambda: corvelbase.ocr(SAMPLE, timeout=0), ValueError),
    (lambda: corvelbase.ocr("https://example.org/page.png"), ValueError),
    (lambda: corvelbase.render([], "docx"), ValueError),
    (lambda: corvelbase.write([], "out.docx"), ValueError),
])
def test_misuse_is_refused_before_anything_runs(call, kind):
    with pytest.raises(kind):
        call()


def timed(function):
    start = time.monotonic()
    function()
    return time.monotonic() - start


def cpu_seconds():
    usage = resource.getrusage(resource.RUSAGE_SELF)
    return usage.ru_utime + usage.ru_stime


@pytest.mark.skipif((os.cpu_count() or 1) < 2, reason="needs two cores")
def test_the_gil_is_free_while_the_engine_works_and_two_threads_finish_faster():
    pages = [OCR / f"{name}.png" for name in ("two-columns", "one-column", "sample", "german")]
    read = lambda page: corvelbase.ocr(page, languages="en-US")  # noqa: E731
    ticks, stop = [], threading.Event()

    def tick():
        while not stop.wait(0.002):
            ticks.append(time.monotonic())

    with concurrent.futures.ThreadPoolExecutor(2) as pool:
        list(pool.map(read, pages[:2]))  # two engines are started
        serial = timed(lambda: [read(page) for page in pages])
        ticker = threading.Thread(target=tick)
        ticker.start()
        cpu = cpu_seconds()
        parallel = timed(lambda: list(pool.map(read, pages)))
        cpu = cpu_seconds() - cpu
        stop.set()
        ticker.join()
    # Another Python thread ran all along: had a recognition held the GIL, it would have
    # stood still for a page's reading, about a quarter of the time (however loaded the
    # machine, since that stretches both alike).
    assert max(b - a for a, b in zip(ticks, ticks[1:])) < parallel / 6
    # And given two cores (another process on the machine may hold one), two threads
    # finish faster than one page after the other.
    if cpu > 1.5 * parallel:
        assert parallel < 0.8 * serial


def test_cancel_stops_waiting_and_running_jobs():
    big = sorted((OCR / "pages").glob("*.png"))
    one_big_page = timed(lambda: corvelbase.ocr(big[0], languages="en-US"))
    # Fourteen pages, two of them a PDF's: the queue starts six, the others wait for it.
    sources = big + big[:2] + [DOCUMENTS / "scan.pdf"]
    futures = [corvelbase.submit(source, languages="en-US") for source in sources]
    assert all(future.cancel() for future in futures)
    assert all(future.cancelled() for future in futures)
    with pytest.raises(concurrent.futures.CancelledError):
        futures[0].result(timeout=0)
    # Had the running pages gone on, the next page would wait for three pages' reading
    # on each core; had the waiting ones run too, for six.
    after = timed(lambda: corvelbase.ocr(OCR / "one-column.png", languages="en-US"))
    assert after < 2 * one_big_page
