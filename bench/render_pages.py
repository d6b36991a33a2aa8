#!/usr/bin/python3
"""Renders the benchmark pages into tests/fixtures/ocr: pages/page-NN.png (ten A4 pages at
300 dpi, odd ones one column, even ones two) and lines/line-NNN.png (100 single lines cut
from them, lines/lines.txt their texts), each page with its text in reading order beside
it. bench_ocr, bench_documents and bench_png_decode read them; a few tests read one page
or line as a large or small input. The committed files are its output: run it from
anywhere, ./render_pages.py. Needs what tests/fixtures/ocr/render.py needs.
"""
import os
import random
import sys

from PIL import Image, ImageDraw, ImageFont

sys.path.insert(0, os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", "tests",
                                "fixtures", "ocr"))
from render import HERE, SANS_BOLD, SERIF, page, two_columns, wrap, write_png  # noqa: E402

# --- generated prose for the benchmark pages ------------------------------------------

SUBJECTS = ["the archive", "our office", "the small team", "every reader", "the night shift",
            "the new scanner", "a careful clerk", "the committee", "the printer in the hall",
            "each department", "the harbour museum", "the weekly report"]
VERBS = ["keeps", "sorts", "reviews", "copies", "describes", "collects", "labels", "checks",
         "measures", "returns", "prepares", "explains"]
OBJECTS = ["old letters from the north", "the invoices of last winter", "a box of faded maps",
           "twelve folders of receipts", "the minutes of every meeting",
           "photographs of the river", "the plans for the garden", "contracts with the bakery",
           "notes about the weather", "the timetable of the ferry", "a list of missing books",
           "drawings of the lighthouse"]
ENDINGS = ["before the end of the month", "with great patience", "in the quiet morning",
           "after lunch on Fridays", "without any help", "for the next visitor",
           "when the rain stops", "as the rules require", "in alphabetical order",
           "by hand and by machine"]


def sentence(rng):
    text = " ".join([rng.choice(SUBJECTS), rng.choice(VERBS), rng.choice(OBJECTS),
                     rng.choice(ENDINGS)])
    return text[0].upper() + text[1:] + "."


def prose(rng, sentences):
    return " ".join(sentence(rng) for _ in range(sentences))


def bench_pages(count):
    """Full A4 pages at 300 dpi: odd pages one column, even pages two columns."""
    rng = random.Random(20261122)
    os.makedirs(os.path.join(HERE, "pages"), exist_ok=True)
    lines = []
    for index in range(1, count + 1):
        name = "pages/page-%02d" % index
        if index % 2:
            paragraphs = [prose(rng, 6) for _ in range(7)]
            font = ImageFont.truetype(SERIF, 42)
            image = page(2480, 3508)
            draw = ImageDraw.Draw(image)
            y = 240
            for paragraph in paragraphs:
                for line in wrap(paragraph, font, 2480 - 480):
                    draw.text((240, y), line, font=font, fill=0)
                    lines.append((name, (240, y, 240 + int(font.getlength(line)), y + 42), line))
                    y += 60
                y += 30
            write_png(name, image, 300, paragraphs)
        else:
            heading = "Report number %d of the archive" % index
            left = [prose(rng, 4) for _ in range(5)]
            right = [prose(rng, 4) for _ in range(5)]
            image = two_columns(heading, left, right, 40, 2480, 3508, SERIF, SANS_BOLD)
            write_png(name, image, 300, [heading] + left + right)
    return lines


def line_images(lines, count):
    """Single lines cut from the benchmark pages, with a margin of white around them."""
    os.makedirs(os.path.join(HERE, "lines"), exist_ok=True)
    rng = random.Random(7)
    chosen = rng.sample(lines, count)
    with open(os.path.join(HERE, "lines", "lines.txt"), "w", encoding="utf-8") as out:
        for index, (name, (left, top, right, bottom), text) in enumerate(chosen, 1):
            source = Image.open(os.path.join(HERE, name + ".png"))
            crop = source.crop((left - 20, top - 16, right + 20, bottom + 24))
            crop.save(os.path.join(HERE, "lines", "line-%03d.png" % index), dpi=(300, 300),
                      optimize=True)
            out.write(text + "\n")


if __name__ == "__main__":
    line_images(bench_pages(10), 100)
