"""Office documents in ZIP containers: Office Open XML with its macro and template kinds, and OpenDocument."""

import io
import zipfile

DONORS = ["r-cran-officer", "fonts-sil-mingzat", "pscan-chip", "libdds-dev", "xlsx2csv", "r-cran-readxl",
          "r-cran-openxlsx", "python3-canmatrix", "hspell", "writer2latex-manual", "cups-filters", "python-odf-doc",
          "python3-relatorio", "libreoffice-help-fr", "python-py7zr-doc", "libtrompeloeil-cpp-dev", "dpf-source"]

OFFICER = "usr/lib/R/site-library/officer/doc_examples/"
OFFICER_TESTS = "usr/share/doc/r-cran-officer/tests/testthat/docs_dir/"
READXL = "usr/lib/R/site-library/readxl/extdata/"
SHEETS = "usr/share/doc/xlsx2csv/examples/test/"
OPEN_XML = "application/vnd.openxmlformats-officedocument."
WORD = OPEN_XML + "wordprocessingml.document"
SHEET = OPEN_XML + "spreadsheetml.sheet"
SLIDES = OPEN_XML + "presentationml.presentation"
OPEN_DOCUMENT = "application/vnd.oasis.opendocument."

COMMENTS = """<p:cmLst xmlns:p="http://schemas.openxmlformats.org/presentationml/2006/main"><p:cm authorId="0" idx="1">
<p:pos x="1" y="1"/><p:text>Bitte überarbeiten</p:text></p:cm></p:cmLst>"""
COMMENTS_RELATION = """<Relationship Id="rId99" Target="../comments/comment1.xml"
Type="http://schemas.openxmlformats.org/officeDocument/2006/relationships/comments"/></Relationships>"""


def changed(path, changes, added=()):
    """A container with some of its members changed: member to (old, new)."""
    out = io.BytesIO()
    with zipfile.ZipFile(path) as source, zipfile.ZipFile(out, "w", zipfile.ZIP_DEFLATED) as target:
        for name in source.namelist():
            content = source.read(name)
            if name in changes:
                old, new = changes[name]
                if old.encode() not in content:
                    raise ValueError(f"{path}: {name} does not hold {old}")
                content = content.replace(old.encode(), new.encode())
            target.writestr(name, content)
        for name, content in added:
            target.writestr(name, content)
    return out.getvalue()


def as_kind(path, kind):
    """The same document as a template, or as one that may hold macros: the type of its main part tells."""
    main = {"docx": WORD, "xlsx": SHEET, "pptx": SLIDES}[path.rsplit(".", 1)[1]] + ".main+xml"
    return changed(path, {"[Content_Types].xml": (main, kind)})


def word(corpus):
    officer = corpus.donor("r-cran-officer", OFFICER + "example.docx")
    words = ["Phasellus", "Internode", "Merged", "17,65204912"]
    fields = {"KOVAMDTitle": "document title", "KOVAMDAuthors": "author", "KOVAMDDescription": "document subject",
              "KOVAMDComment": "these are comments", "KOVAMDContributors": "David Gohel",
              "KOVAMDOrganizations": "ArData", "KOVAMDContentCreationDate": 1493212200}
    corpus.add("word/report.docx", officer, words, fields, mime=WORD)
    corpus.add("word/form.dotx", as_kind(officer, OPEN_XML + "wordprocessingml.template.main+xml"), words, fields)
    corpus.add("word/macros.docm", as_kind(officer, "application/vnd.ms-word.document.macroEnabled.main+xml"), words,
               fields)
    corpus.add("word/unnamed", officer, words, fields, mime=WORD)
    corpus.add("word/comments.docx", corpus.donor_bytes("r-cran-officer", OFFICER_TESTS + "table-complex.docx.gz"),
               ["quite", "column", "Deleting", "fixes"], {"KOVAMDAuthors": "Frank Hangler"}, mime=WORD)
    corpus.add("word/lepcha.docx", corpus.donor_bytes(
        "fonts-sil-mingzat", "usr/share/doc/fonts-sil-mingzat/documentation/Mingzat-typesample.docx.gz"),
        ["Supplement", "ᰣᰦᰜᰩᰵ", "ᰣᰦᰕᰫᰓᰨᰍᰪ", "ᰀᰤᰩᰵᰀᰦ"],
        {"KOVAMDAuthors": "Lorna A. Priest", "KOVAMDContributors": "Lorna Evans"}, mime=WORD)
    corpus.add("word/chips.docx", corpus.donor_bytes("pscan-chip", "usr/share/doc/pscan-chip/README.docx.gz"),
               ["transfac", "Sknshra", "Zambelli", "PMC3692095"], mime=WORD)
    corpus.add("word/bridge.docx", corpus.donor_bytes(
        "libdds-dev", "usr/share/doc/libdds-dev/2014-11 Performance and Benchmarking.docx.gz"),
        ["sequentially", "trump", "TTs", "gain"], {"KOVAMDAuthors": "Soren Hein", "KOVAMDNumberOfPages": "9"},
        mime=WORD)


def sheets(corpus):
    deaths = corpus.donor("r-cran-readxl", READXL + "deaths.xlsx")
    # Dates as the file has them, and the last row of the last sheet.
    words = ["Bowie", "1947-01-08", "astronaut", "Summit", "signing"]
    corpus.add("sheet/people.xlsx", deaths, words, {"KOVAMDAuthors": "Microsoft Office User"}, mime=SHEET)
    corpus.add("sheet/form.xltx", as_kind(deaths, OPEN_XML + "spreadsheetml.template.main+xml"), words)
    corpus.add("sheet/greetings.xlsx", corpus.donor("xlsx2csv", SHEETS + "utf8.xlsx"),
               ["สวัสดี", "こんにちは", "Здравствуйте", "नमस्ते", "السلام"], mime=SHEET)
    corpus.add("sheet/when.xlsx", corpus.donor("xlsx2csv", SHEETS + "datetime.xlsx"), ["2011-09-15"],
               {"KOVAMDAuthors": "Saida Temirkhodjaeva"}, mime=SHEET)
    corpus.add("sheet/macros.xlsm", corpus.donor("xlsx2csv", SHEETS + "hyperlinks.xlsm"),
               ["google", "yahoo", "gmail", "reddit", "github"])
    corpus.add("sheet/discussed.xlsx",
               corpus.donor("r-cran-openxlsx", "usr/lib/R/site-library/openxlsx/extdata/loadThreadComment.xlsx"),
               ["threaded", "allows", "edits"], {"KOVAMDAuthors": "Jean-Marie Pivette"}, mime=SHEET)
    corpus.add("sheet/signals.xlsx",
               corpus.donor("python3-canmatrix", "usr/share/doc/python3-canmatrix/examples/cmTemplate.xlsx"),
               ["Byteorder", "additionalCollumns", "Phys", "Starting"],
               {"KOVAMDAuthors": "Bröcker, Eduard | BFFT GmbH"}, mime=SHEET)


def slides(corpus):
    officer = corpus.donor("r-cran-officer", OFFICER + "example.pptx")
    words = ["logo", "unordered", "paragraphs", "Salut", "12.23"]
    fields = {"KOVAMDTitle": "document title", "KOVAMDKeywords": None, "KOVAMDContentCreationDate": 1493292580}
    corpus.add("slides/talk.pptx", officer, words, fields, mime=SLIDES)
    corpus.add("slides/form.potx", as_kind(officer, OPEN_XML + "presentationml.template.main+xml"), words, fields)
    corpus.add("slides/macros.pptm", as_kind(
        officer, "application/vnd.ms-powerpoint.presentation.macroEnabled.main+xml"), words, fields)
    corpus.add("slides/table.pptx", corpus.donor_bytes("r-cran-officer", OFFICER_TESTS + "table-complex.pptx.gz"),
               ["sisi", "tutu", "Header", "Salut"], {"KOVAMDContributors": "David Gohel"}, mime=SLIDES)
    corpus.add("slides/commented.pptx", changed(officer, {
        "ppt/slides/_rels/slide1.xml.rels": ("</Relationships>", COMMENTS_RELATION)},
        [("ppt/comments/comment1.xml", COMMENTS)]), ["Bitte", "überarbeiten", "unordered"], mime=SLIDES)


def open_documents(corpus):
    # With notes, whose marks stand in the midst of words, and with headers.
    corpus.add("odf/hebrew.odt", corpus.donor("hspell", "usr/share/doc/hspell/niqqudless.odt"),
               ["הראל", "תיהנה", "בתיבה", "חודשו", "חופשית", "ivrix"],
               {"KOVAMDTitle": "סוגיות בכתיב חסר הניקוד", "KOVAMDNumberOfPages": "110"}, mime=OPEN_DOCUMENT + "text")
    corpus.add("odf/manual.odt",
               corpus.donor("writer2latex-manual", "usr/share/doc/writer2latex/manual/user-manual.odt"),
               ["natively", "keep_image_size", "ignore_table_dimensions", "Extended"],
               {"KOVAMDAuthors": "Henrik Just", "KOVAMDContributors": None}, mime=OPEN_DOCUMENT + "text")
    corpus.add("odf/russian.odt", corpus.donor("cups-filters", "usr/share/cups/data/form_russian_in.odt"),
               ["ИНФОРМАЦИЯ", "задания", "пользователь", "печати"], mime=OPEN_DOCUMENT + "text")
    # Numbers are found as they are shown and as they are.
    corpus.add("odf/countries.ods",
               corpus.donor("python-odf-doc", "usr/share/doc/python-odf-doc/examples/countrystatistics.ods"),
               ["Iceland", "244820", "Slovakia", "Hong", "48845"], {"KOVAMDAuthors": "Søren Roug"},
               mime=OPEN_DOCUMENT + "spreadsheet")
    corpus.add("odf/cars.ods",
               corpus.donor("libreoffice-help-fr", "usr/share/libreoffice/help/media/files/scalc/fr/pivot.ods"),
               ["Modèle", "Atelier", "Résultat", "Inventaires", "Décembre", "Soma"],
               {"KOVAMDAuthors": "Pierre-Yves SAMYN"}, mime=OPEN_DOCUMENT + "spreadsheet")
    corpus.add("odf/orders.ods", corpus.donor("python3-relatorio", "usr/share/doc/python3-relatorio/examples/pivot.ods"),
               ["Quantity", "customer", "Filter", "Result"], mime=OPEN_DOCUMENT + "spreadsheet")
    presentation = OPEN_DOCUMENT + "presentation"
    corpus.add("odf/compression.odp", corpus.donor(
        "python-py7zr-doc", "usr/share/doc/python-py7zr-doc/html/_downloads/95258fe72f1c2ee14b78d021ee45a0e4/"
        "Introduction_of_py7zr.odp"), ["Hiroshi", "brotli", "entropy", "Pavlov"], mime=presentation)
    corpus.add("odf/mocks.odp", corpus.donor(
        "libtrompeloeil-cpp-dev", "usr/share/doc/trompeloeil/docs/trompeloeil_cheat_sheet.odp"),
        ["cheat", "expectations", "NAMED_REQUIRE_DESTRUCTION", "deathwatched"], {"KOVAMDAuthors": "Björn"},
        mime=presentation)
    corpus.add("odf/plugins.odp", corpus.donor("dpf-source", "usr/share/dpf/lac/2014-small-talk.odp"),
               ["DISTRHO", "imageKnobValueChanged", "Questions", "zamaudio"], mime=presentation)
    corpus.add("odf/chart.odp", corpus.donor(
        "python3-relatorio", "usr/share/doc/python3-relatorio/examples/presentation.odp"),
        ["Quantity", "reference"], {"KOVAMDAuthors": "Udo Spallek"}, mime=presentation)


def make(corpus):
    word(corpus)
    sheets(corpus)
    slides(corpus)
    open_documents(corpus)
