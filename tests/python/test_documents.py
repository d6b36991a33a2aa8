# Documents through the module: every page of a PDF or a multi-page TIFF, from a path or
# from bytes, and the output formats, which must be what `corvel ocr` writes for the
# same inputs.
import difflib
import pickle
import subprocess

import numpy
import pytest
from PIL import Image

import corvelbase
from conftest import DOCUMENTS, OCR

FAST = {"languages": ["en-US"], "level": "fast"}
TIFF, SCAN, MIXED = (str(DOCUMENTS / name) for name in ("pages.tif", "scan.pdf", "mixed.pdf"))
SAMPLE = str(OCR / "sample.png")


def similarity(a, b):
    return difflib.SequenceMatcher(None, a.split(), b.split()).ratio()


def pdf_text(path):
    return subprocess.run(["pdftotext", str(path), "-"], check=True,
                          capture_output=True, text=True).stdout


@pytest.mark.parametrize("document, pages", [(TIFF, ["one-column", "french"]),
                                             (SCAN, ["sample", "two-columns"])])
@pytest.mark.parametrize("as_bytes", [False, True], ids=["path", "bytes"])
def test_every_page_of_a_document_is_read_in_order(document, pages, as_bytes):
    with open(document, "rb") as file:
        source = file.read() if as_bytes else document
    result = corvelbase.ocr(source, **FAST)
    assert [page.index for page in result.pages] == [0, 1]
    assert result.text == "\f".join(page.text for page in result.pages)
    assert result.name == (None if as_bytes else document)
    for page, name in zip(result.pages, pages):
        assert similarity(page.text, (OCR / f"{name}.txt").read_text()) > 0.8
        assert page.resolution == 150 and page.words and page.error is None


def test_pdf_pages_with_text_keep_it_unless_forced():
    kept, forced = (corvelbase.ocr(MIXED, force_ocr=force, **FAST) for force in (False, True))
    typed = "Typed words stay as they are"
    assert kept.pages[0].has_own_text and kept.pages[0].text == typed
    assert not kept.pages[0].blocks
    assert not forced.pages[0].has_own_text and similarity(forced.pages[0].text, typed) > 0.8
    assert not kept.pages[1].has_own_text and kept.pages[1].text


@pytest.fixture(scope="module")
def results():
    return [corvelbase.ocr(source, **FAST) for source in (TIFF, SAMPLE)]


# The format named by the file's extension; several results make one document.
@pytest.mark.parametrize("format, extension", [
    ("txt", "txt"), ("json", "json"), ("hocr", "html"), ("alto", "xml"), ("tsv", "tsv")])
def test_outputs_are_what_the_command_line_writes(corvel_tool, results, tmp_path, format,
                                                  extension):
    expected = subprocess.run(
        [corvel_tool, "ocr", "--fast", "--lang", "en-US", "--format", format, TIFF, SAMPLE],
        check=True, capture_output=True, text=True).stdout
    corvelbase.write(results, tmp_path / f"out.{extension}")
    assert (tmp_path / f"out.{extension}").read_text() == expected
    assert corvelbase.render(results, format) == expected


def test_searchable_pdfs_of_documents_and_of_pixels(corvel_tool, tmp_path):
    corvelbase.ocr(SCAN, **FAST).save(tmp_path / "module.pdf")
    subprocess.run([corvel_tool, "ocr", "--fast", "--lang", "en-US", "-o",
                    tmp_path / "tool.pdf", SCAN], check=True, capture_output=True)
    assert pdf_text(tmp_path / "module.pdf") == pdf_text(tmp_path / "tool.pdf")
    # Pixels have no file behind them: their picture goes into the PDF as it was read.
    read = corvelbase.ocr(numpy.asarray(Image.open(SAMPLE).convert("L")), **FAST)
    read.save(tmp_path / "pixels.out", format="pdf")
    words = sorted(pdf_text(tmp_path / "pixels.out").split())
    assert similarity(" ".join(words), " ".join(sorted(read.text.split()))) > 0.9


def test_what_cannot_be_written_is_refused(results, tmp_path):
    # A result sent to another process keeps its pages, not its document.
    copy = pickle.loads(pickle.dumps(results[0]))
    assert copy == results[0]
    with pytest.raises(ValueError):
        copy.save(tmp_path / "copy.txt")
    with pytest.raises(ValueError):  # a searchable PDF is one document's
        corvelbase.write(results, tmp_path / "both.pdf")
    assert not list(tmp_path.iterdir())
