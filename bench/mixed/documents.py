"""Bytes of documents: PDF, office files, OpenDocument, RTF, EPUB. Small, but whole files, made without any library."""

import io
import zipfile
import zlib
from xml.sax.saxutils import escape

LINE_WIDTH = 90
LINES_PER_PAGE = 55
XML = '<?xml version="1.0" encoding="UTF-8"?>\n'
OOXML = "http://schemas.openxmlformats.org"


def _zip(members, first=None):
    out = io.BytesIO()
    with zipfile.ZipFile(out, "w", zipfile.ZIP_DEFLATED) as archive:
        if first:
            archive.writestr(zipfile.ZipInfo(first[0]), first[1])
        for name, text in members.items():
            archive.writestr(zipfile.ZipInfo(name), text if isinstance(text, bytes) else XML + text,
                             zipfile.ZIP_DEFLATED)
    return out.getvalue()


def lines(paragraphs, width=LINE_WIDTH):
    for paragraph in paragraphs:
        line = ""
        for word in paragraph.replace("。", "。 ").split():
            if len(line) + len(word) > width:
                yield line
                line = ""
            line += " " * bool(line) + word
        yield line


# PDF

def _pdf_text(text):
    return "<FEFF" + text.encode("utf-16-be").hex().upper() + ">"


def _latin_line(line):
    safe = line.encode("cp1252", "replace")
    return b"(" + safe.replace(b"\\", b"\\\\").replace(b"(", b"\\(").replace(b")", b"\\)") + b") Tj T*\n"


def _wide_line(line):
    return b"<" + line.encode("utf-16-be").hex().encode() + b"> Tj T*\n"


def _stream(data, extra=""):
    packed = zlib.compress(data)
    return f"<< /Length {len(packed)} /Filter /FlateDecode {extra}>>\nstream\n".encode() + packed + b"\nendstream"


def _to_unicode(text):
    characters = sorted({c for c in text if ord(c) < 0x10000})
    table = "/CIDInit /ProcSet findresource begin 12 dict begin begincmap /CMapName /W def /CMapType 2 def\n" \
            "1 begincodespacerange <0000> <FFFF> endcodespacerange\n"
    for at in range(0, len(characters), 100):
        part = characters[at:at + 100]
        table += f"{len(part)} beginbfchar\n"
        table += "".join(f"<{ord(c):04X}> <{ord(c):04X}>\n" for c in part) + "endbfchar\n"
    return (table + "endcmap end end\n").encode()


def _fonts(text):
    if all(ord(c) < 0x180 for c in text):
        return [b"<< /Type /Font /Subtype /Type1 /BaseFont /Helvetica /Encoding /WinAnsiEncoding >>"]
    return [b"<< /Type /Font /Subtype /Type0 /BaseFont /Wide /Encoding /Identity-H /DescendantFonts [5 0 R] "
            b"/ToUnicode 7 0 R >>",
            b"<< /Type /Font /Subtype /CIDFontType2 /BaseFont /Wide /CIDSystemInfo << /Registry (Adobe) /Ordering "
            b"(Identity) /Supplement 0 >> /FontDescriptor 6 0 R >>",
            b"<< /Type /FontDescriptor /FontName /Wide /Flags 4 /FontBBox [0 0 1000 1000] /ItalicAngle 0 /Ascent 800 "
            b"/Descent -200 /CapHeight 700 /StemV 80 >>",
            _stream(_to_unicode(text))]


def pdf(title, author, paragraphs, drawing=0):
    """`drawing`: so many strokes on each page, which only slow down who reads it."""
    fonts = _fonts("".join(paragraphs))
    one_line, width = (_latin_line, LINE_WIDTH) if len(fonts) == 1 else (_wide_line, LINE_WIDTH // 2)
    all_lines = list(lines(paragraphs, width))
    strokes = b"".join(b"%d %d m %d %d l S\n" % (i % 600, i % 800, i * 7 % 600, i * 3 % 800) for i in range(drawing))
    info = f"<< /Title {_pdf_text(title)} /Author {_pdf_text(author)} /CreationDate (D:20240301120000Z) >>"
    objects = [b"<< /Type /Catalog /Pages 2 0 R >>", b"", info.encode()] + fonts
    pages = []
    for at in range(0, len(all_lines), LINES_PER_PAGE):
        text = b"".join(map(one_line, all_lines[at:at + LINES_PER_PAGE]))
        objects.append(_stream(strokes + b"BT /F1 10 Tf 40 800 Td 14 TL\n" + text + b"ET\n"))
        objects.append(b"<< /Type /Page /Parent 2 0 R /MediaBox [0 0 595 842] /Resources << /Font << /F1 4 0 R >> >> "
                       b"/Contents %d 0 R >>" % len(objects))
        pages.append(len(objects))
    kids = " ".join(f"{number} 0 R" for number in pages)
    objects[1] = f"<< /Type /Pages /Kids [{kids}] /Count {len(pages)} >>".encode()
    out, places = b"%PDF-1.5\n%\xe2\xe3\xcf\xd3\n", []
    for number, body in enumerate(objects, 1):
        places.append(len(out))
        out += b"%d 0 obj\n" % number + body + b"\nendobj\n"
    table = b"".join(b"%010d 00000 n \n" % place for place in places)
    return out + b"xref\n0 %d\n0000000000 65535 f \n" % (len(objects) + 1) + table + \
        b"trailer\n<< /Size %d /Root 1 0 R /Info 3 0 R >>\nstartxref\n%d\n%%%%EOF\n" % (len(objects) + 1, len(out))


# Office

def _core(title, author):
    return f'<cp:coreProperties xmlns:cp="{OOXML}/package/2006/metadata/core-properties" ' \
           f'xmlns:dc="http://purl.org/dc/elements/1.1/"><dc:title>{escape(title)}</dc:title>' \
           f"<dc:creator>{escape(author)}</dc:creator></cp:coreProperties>"


def _relations(targets):
    kind = f"{OOXML}/officeDocument/2006/relationships/"
    core = f"{OOXML}/package/2006/relationships/metadata/core-properties"
    return f'<Relationships xmlns="{OOXML}/package/2006/relationships">' + "".join(
        f'<Relationship Id="rId{number}" Type="{core if name == "core" else kind + name}" Target="{target}"/>'
        for number, (name, target) in enumerate(targets, 1)) + "</Relationships>"


def _office(main, main_type, title, author, members):
    base = "application/vnd.openxmlformats-officedocument."
    types = f'<Types xmlns="{OOXML}/package/2006/content-types">' \
            '<Default Extension="xml" ContentType="application/xml"/>' \
            '<Default Extension="rels" ContentType="application/vnd.openxmlformats-package.relationships+xml"/>' \
            f'<Override PartName="/{main}" ContentType="{base}{main_type}.main+xml"/></Types>'
    return _zip({"[Content_Types].xml": types, "docProps/core.xml": _core(title, author), **members,
                 "_rels/.rels": _relations([("officeDocument", main), ("core", "docProps/core.xml")])})


def docx(title, author, paragraphs):
    name = f"{OOXML}/wordprocessingml/2006/main"
    body = "".join(f'<w:p><w:r><w:t xml:space="preserve">{escape(text)}</w:t></w:r></w:p>' for text in paragraphs)
    return _office("word/document.xml", "wordprocessingml.document", title, author, {
        "word/document.xml": f'<w:document xmlns:w="{name}"><w:body>{body}</w:body></w:document>'})


def xlsx(title, author, paragraphs, sheet_name):
    name = f"{OOXML}/spreadsheetml/2006/main"
    cells = [cell for paragraph in paragraphs for cell in (paragraph[:60], paragraph[60:]) if cell]
    texts = "".join(f"<si><t>{escape(cell)}</t></si>" for cell in cells)
    rows = "".join(f'<row r="{row}"><c r="A{row}" t="s"><v>{row - 1}</v></c><c r="B{row}"><v>{row * 37 % 1009}.5</v></c>'
                   "</row>" for row in range(1, len(cells) + 1))
    return _office("xl/workbook.xml", "spreadsheetml.sheet", title, author, {
        "xl/workbook.xml": f'<workbook xmlns="{name}" xmlns:r="{OOXML}/officeDocument/2006/relationships"><sheets>'
                           f'<sheet name="{escape(sheet_name)}" sheetId="1" r:id="rId1"/></sheets></workbook>',
        "xl/_rels/workbook.xml.rels": _relations([("worksheet", "worksheets/sheet1.xml"),
                                                  ("sharedStrings", "sharedStrings.xml")]),
        "xl/sharedStrings.xml": f'<sst xmlns="{name}">{texts}</sst>',
        "xl/worksheets/sheet1.xml": f'<worksheet xmlns="{name}"><sheetData>{rows}</sheetData></worksheet>'})


def pptx(title, author, slides, note):
    names = f'xmlns:p="{OOXML}/presentationml/2006/main" xmlns:a="{OOXML}/drawingml/2006/main" ' \
            f'xmlns:r="{OOXML}/officeDocument/2006/relationships"'

    def page(kind, text):
        return f"<p:{kind} {names}><p:cSld><p:spTree><p:sp><p:txBody><a:p><a:r><a:t>{escape(text)}</a:t></a:r></a:p>" \
               f"</p:txBody></p:sp></p:spTree></p:cSld></p:{kind}>"
    listed = "".join(f'<p:sldId id="{255 + i}" r:id="rId{i}"/>' for i in range(1, len(slides) + 1))
    members = {f"ppt/slides/slide{i}.xml": page("sld", text) for i, text in enumerate(slides, 1)}
    members["ppt/presentation.xml"] = f"<p:presentation {names}><p:sldIdLst>{listed}</p:sldIdLst></p:presentation>"
    members["ppt/_rels/presentation.xml.rels"] = _relations(
        [("slide", f"slides/slide{i}.xml") for i in range(1, len(slides) + 1)])
    members["ppt/slides/_rels/slide1.xml.rels"] = _relations([("notesSlide", "../notesSlides/notesSlide1.xml")])
    members["ppt/notesSlides/notesSlide1.xml"] = page("notes", note)
    return _office("ppt/presentation.xml", "presentationml.presentation", title, author, members)


def odt(title, author, paragraphs):
    base = "urn:oasis:names:tc:opendocument:xmlns:"
    names = f'xmlns:office="{base}office:1.0" xmlns:text="{base}text:1.0" xmlns:meta="{base}meta:1.0" ' \
            'xmlns:dc="http://purl.org/dc/elements/1.1/"'
    body = "".join(f"<text:p>{escape(text)}</text:p>" for text in paragraphs)
    kind = "application/vnd.oasis.opendocument.text"
    return _zip({
        "content.xml": f"<office:document-content {names}><office:body><office:text>{body}</office:text></office:body>"
                       "</office:document-content>",
        "meta.xml": f"<office:document-meta {names}><office:meta><dc:title>{escape(title)}</dc:title>"
                    f"<meta:initial-creator>{escape(author)}</meta:initial-creator><dc:creator>{escape(author)}"
                    "</dc:creator></office:meta></office:document-meta>",
        "META-INF/manifest.xml": f'<m:manifest xmlns:m="{base}manifest:1.0"><m:file-entry m:full-path="/" '
                                 f'm:media-type="{kind}"/></m:manifest>'}, ("mimetype", kind))


def epub(title, author, chapters):
    spine = range(1, len(chapters) + 1)
    members = {f"text/{i}.xhtml": f'<html xmlns="http://www.w3.org/1999/xhtml"><head><title>{i}</title></head><body><p>'
                                  f"{escape(text)}</p></body></html>" for i, text in enumerate(chapters, 1)}
    members["META-INF/container.xml"] = \
        '<container version="1.0" xmlns="urn:oasis:names:tc:opendocument:xmlns:container"><rootfiles><rootfile ' \
        'full-path="book.opf" media-type="application/oebps-package+xml"/></rootfiles></container>'
    items = "".join(f'<item id="c{i}" href="text/{i}.xhtml" media-type="application/xhtml+xml"/>' for i in spine)
    refs = "".join(f'<itemref idref="c{i}"/>' for i in spine)
    members["toc.ncx"] = '<ncx xmlns="http://www.daisy.org/z3986/2005/ncx/" version="2005-1"><navMap/></ncx>'
    members["book.opf"] = \
        '<package xmlns="http://www.idpf.org/2007/opf" version="2.0" unique-identifier="id"><metadata ' \
        f'xmlns:dc="http://purl.org/dc/elements/1.1/"><dc:title>{escape(title)}</dc:title><dc:creator>{escape(author)}' \
        '</dc:creator><dc:identifier id="id">1</dc:identifier><dc:language>en</dc:language></metadata><manifest>' \
        f'<item id="ncx" href="toc.ncx" media-type="application/x-dtbncx+xml"/>{items}</manifest>' \
        f'<spine toc="ncx">{refs}</spine></package>'
    return _zip(members, ("mimetype", "application/epub+zip"))


def rtf(title, author, paragraphs):
    def text(part):
        return "".join(f"\\u{ord(c) if ord(c) < 32768 else ord(c) - 65536}?" if ord(c) > 126 else
                       "\\" + c if c in "\\{}" else c for c in part)
    body = "\\par\n".join(map(text, paragraphs))
    return f"{{\\rtf1\\ansi\\deff0{{\\fonttbl{{\\f0 Times New Roman;}}}}{{\\info{{\\title {text(title)}}}" \
           f"{{\\author {text(author)}}}}}\n{body}\\par}}\n".encode("ascii")
