"""Hostile texts, markup, office files, mail and PDF."""

import io
import zipfile
import zlib

from seeds import (END, FAT_SECTOR, HTML, MAIL, NONE, RTF, WORD, XML, compound, doc, docx, epub, odt, pack, pdf, ppt, pptx,
                   record, relations, slide, stream, xls, xlsx, zipped)

MEGABYTE = 1 << 20
ENTITIES = b"<!DOCTYPE a [%s]>"
BILLION = ENTITIES % (b'<!ENTITY l0 "lol">' + b"".join(
    b'<!ENTITY l%d "%s">' % (i, b"&l%d;" % (i - 1) * 10) for i in range(1, 10)))
QUADRATIC = ENTITIES % (b'<!ENTITY q "' + b"q" * 50000 + b'">')
EXTERNAL = ENTITIES % (b'<!ENTITY x SYSTEM "file:///etc/passwd"><!ENTITY % y SYSTEM "file:///etc/passwd"> %y;')


def add_markup(out):
    bombs = {"billion": BILLION + b"<a>&l9;</a>", "quadratic": QUADRATIC + b"<a>" + b"&q;" * 50000 + b"</a>",
             "external": EXTERNAL + b"<a>&x;</a>", "deep": b"<a>" * 200000 + b"</a>" * 200000,
             "unclosed": b"<a b='" + b"<" * (4 * MEGABYTE), "quotes": b"<a " + b"'\"" * MEGABYTE,
             "comments": b"<!--" * MEGABYTE, "references": b"&#x41;&amp;&bogus;&#x110000;" * 100000,
             "ampersands": b"<a>" + b"&" * (2 * MEGABYTE), "brackets": b"<!DOCTYPE a [" + b"[<" * MEGABYTE,
             "scripts": b"<script>" * 200000, "titles": b"<title>" * 200000, "meta": b"<meta charset=" * 200000,
             "encoding": b'<?xml version="1.0" encoding="' + b"UTF-7" * 100 + b'"?><a>+ADw-</a>'}
    for name, content in bombs.items():
        out.add(f"markup/{name}.xml", content)
        out.add(f"markup/{name}.html", content)
    fill = b"x" * (8 * MEGABYTE)
    for extension in ("xml", "html"):
        out.add(f"markup/attribute.{extension}", b'<a b="', *[b"x" * MEGABYTE] * 50, b'">', XML)
        out.add(f"markup/name.{extension}", b"<", fill, b">")
        out.add(f"markup/comment.{extension}", b"<!--", fill, b"-->", HTML)
        out.add(f"markup/cdata.{extension}", b"<a><![CDATA[", fill, b"]]></a>")
    out.add("markup/utf16.xml", b"\xff\xfe", ("<a>" * 200000).encode("utf-16-le"))
    out.add("markup/surrogates.txt", b"\xff\xfe", b"\x00\xd8" * MEGABYTE)
    out.add("markup/shift.txt", b"\x1b$B" * MEGABYTE)
    out.add("markup/latin.csv", b"\xe9;\xff\n" * MEGABYTE)
    out.add("markup/utf32.txt", b"\xff\xfe\0\0" + b"\xff\xff\x10\0" * 100000)


def add_packages(out):
    out.add("office/ratio344.docx", docx(b"<w:p><w:r><w:t>" + b"zeppelin " * (2 * MEGABYTE) + b"</w:t></w:r></w:p>"))
    for name, body in {"billion": BILLION + b"<w:p>&l9;</w:p>", "external": EXTERNAL + b"<w:p>&x;</w:p>",
                       "deep": b"<w:p>" * 200000, "tables": b"<w:tbl><w:tr><w:tc>" * 200000,
                       "closed": b"</w:p>" * 200000}.items():
        out.add(f"office/{name}.docx", docx(body))
        out.add(f"office/{name}.odt", odt(body.replace(b"w:", b"text:")))
        out.add(f"office/{name}.pptx", pptx(body.replace(b"w:", b"a:")))
    lists = {"one": b"<dc:creator>x</dc:creator>" * 500000,
             "same": b"<dc:creator>" + b"x" * 32700 + b"</dc:creator>" + b"<dc:creator>x</dc:creator>" * 400000,
             "each": b"".join(b"<dc:creator>%d</dc:creator>" % i for i in range(300000))}
    for name, content in lists.items():
        core = b"<cp:coreProperties>" + content + b"</cp:coreProperties>"
        noise = b"".join(zlib.compress(b"%d" % i) for i in range(20000))  # so that the expansion is within its limit
        out.add(f"office/authors_{name}.docx", docx(core=core, extra=[("noise", noise)]))
    out.add("office/texts.xlsx", xlsx(texts=b"<si><t>x</t></si>" * 600000))
    out.add("office/indices.xlsx", xlsx(b'<row><c t="s"><v>99999999999999999999</v></c><c t="s"><v>-1</v></c>'
                                        b'<c t="d"><v>1e400</v></c><c><v>nan</v></c></row>' * 1000))
    out.add("office/repeated.xlsx", xlsx(b'<c t="s"><v>0</v></c>' * 100000, b"<si><t>" + b"x" * 60000 + b"</t></si>"))
    loop = [("_rels/.rels", relations(("officeDocument", "a/../a/../a/b.xml"))),
            ("a/b.xml", b'<p:presentation><p:sldId r:id="r1"/></p:presentation>'),
            ("a/_rels/b.xml.rels", relations(("slide", "b.xml"), ("slide", "../../../../etc/passwd")))]
    out.add("office/loop.pptx", zipped(loop))
    out.add("office/relations.docx", zipped([("_rels/.rels", relations(*[("officeDocument", "x" * 60)] * 50000))]))
    ids = [("slide", f"slides/{i}.xml") for i in range(20000)]
    out.add("office/ids.pptx", zipped([
        ("_rels/.rels", relations(("officeDocument", "ppt/presentation.xml"))),
        ("ppt/presentation.xml", b'<p:presentation>' + b'<p:sldId r:id="r19999"/>' * 20000 + b"</p:presentation>"),
        ("ppt/_rels/presentation.xml.rels", relations(*ids)), ("ppt/slides/19998.xml", b"<p:sld/>")]))
    spine = b'<itemref idref="a"/><itemref idref="b"/>' * 100000
    out.add("office/spine.epub", epub(spine, [("c.xhtml", HTML), ("../o/p.opf", HTML)]))
    out.add("office/chapter.epub", epub(b'<itemref idref="a"/>' * 10, [("c.xhtml", b"<p>x</p>" * MEGABYTE)]))
    out.add("office/itself.epub", zipped([("META-INF/container.xml",
                                           b'<container><rootfile full-path="META-INF/container.xml"/></container>')]))
    target = io.BytesIO()
    with zipfile.ZipFile(target, "w") as file:
        for i in range(20000):
            file.writestr(f"ppt/slides/slide{i}.xml", b"")
    out.add("office/slides.pptx", target.getvalue())


def add_compound(out):
    def to_self(table, directory):
        table[0] = 0

    def all_to_first(table, directory):
        for i in range(len(table)):
            table[i] = 0

    def directory_loop(table, directory):
        table[directory] = directory

    def beyond(table, directory):
        table[0] = 0xFFFFFF00

    book = [("Workbook", record(0x0809, pack("HH", 0x0600, 5)) + bytes(40000)), ("WordDocument", bytes(9000))]
    for name, chain in {"self": to_self, "all": all_to_first, "directory": directory_loop, "beyond": beyond}.items():
        for extension in ("xls", "doc", "msg"):
            out.add(f"compound/{name}.{extension}", compound(book, chain))
            out.add(f"compound/{name}_large.{extension}", compound(book, chain), size=3 << 30)
    for name, header in {"difat": {"more": 3, "more_count": 1 << 30}, "mini": {"mini": 0, "mini_shift": 4},
                         "shift": {"shift": 31}, "shift0": {"shift": 0}, "mini_shift": {"mini_shift": 63},
                         "lists": {"lists": [0] * 109}, "nowhere": {"directory": NONE}}.items():
        out.add(f"compound/{name}.doc", compound(book, header=header))
        out.add(f"compound/{name}_large.doc", compound(book, header=header), size=3 << 30)
    # A list of lists that is itself, in a file with room for eight million sectors; with nothing in it, and with itself.
    for name, entry in (("free", NONE), ("itself", 0)):
        lists = bytearray(pack("I", entry) * 127 + pack("I", 40))
        content = compound(book, header={"more": 40, "more_count": 1 << 30, "lists": [NONE] * 109})
        out.add(f"compound/lists_{name}.doc", content.ljust(512 * 41, b"\xff"), bytes(lists), size=4 << 30)


def add_old_office(out):
    bof = record(0x0809, pack("HH", 0x0600, 5) + bytes(12))
    books = {"text_count": bof + record(0x00FC, pack("II", NONE, NONE) + pack("HB", 0xFFFF, 1) + b"xx"),
             "text_length": bof + record(0x00FC, pack("II", 1, 1) + pack("HBI", 0xFFFF, 0x0C, NONE)) * 9,
             "continues": bof + record(0x00FC, pack("II", NONE, NONE)) + record(0x003C, b"") * 500000,
             "empty": bof + record(0, b"") * MEGABYTE,
             "length": bof + record(0x0204, b"xx", 0xFFFF), "short": bof + b"".join(record(kind, b"x") for kind in range(0x900)),
             "numbers": bof + record(0x00BD, pack("HH", 0, 0) + bytes(6) * 1300) * 200,
             "formats": bof + record(0x041E, pack("HHB", 9, 4, 0) + b"yyyy") * 70000 + record(0x00E0, pack("HH", 0, 9)) * 70000}
    for name, records in books.items():
        out.add(f"old/{name}.xls", xls(records))
    out.add("old/sparse.xls", xls(bof), size=3 << 30)
    slides = {"nested": slide(0x03E8, b"", 15, NONE) * 200000, "length": slide(0x0FA0, WORD, 0, NONE),
              "empty": slide(1, b"") * 500000, "texts": slide(0x0FA0, b"x") * 200000}
    for name, records in slides.items():
        out.add(f"old/{name}.ppt", ppt(records))
    out.add("old/same_place.doc", doc([(1 << 20, 0)] * 100 + [(1 << 21, 0x40000000)] * 100, bytes(MEGABYTE)))
    pieces = [(MEGABYTE * (i % 2 + 1), 0x40000000) for i in range(300000)]
    out.add("old/many_pieces.doc", doc(pieces, bytes(4 * MEGABYTE)))
    out.add("old/fields.doc", doc([(1 << 22, 0x40000000)], b"\x13" * (4 * MEGABYTE)))
    values = b"".join(pack("II", 2 + i % 7, 8 + 8 * 1000) for i in range(1000))
    summary = bytes(44) + pack("I", 48) + pack("II", 0, 1000) + values + pack("III", 30, NONE, 0) + b"x" * 900000
    out.add("old/summary.doc", compound([("WordDocument", bytes(9000)), ("\005SummaryInformation", summary)]))
    out.add("old/wide_summary.doc", compound([("WordDocument", bytes(9000)),
                                              ("\005SummaryInformation", summary.replace(pack("II", 30, NONE), pack("II", 31, NONE)))]))


def add_rich_text(out):
    out.add("rtf/groups.rtf", b"{\\rtf1" + b"{" * MEGABYTE)
    out.add("rtf/binary.rtf", b"{\\rtf1 a\\bin2147483647 ", size=3 << 30)
    out.add("rtf/binaries.rtf", b"{\\rtf1 a" + b"\\bin99999999999999999999 x" * 1000, size=3 << 30)
    out.add("rtf/negative.rtf", b"{\\rtf1 a\\bin-5 b\\u-99999999999 \\uc-1 \\f-1 \\fcharset-7 \\ansicpg-9 c}")
    out.add("rtf/nowhere.rtf", b"{\\rtf1{\\*\\nothing ", size=3 << 30)
    out.add("rtf/fonts.rtf", b"{\\rtf1{\\fonttbl" + b"".join(b"{\\f%d\\fcharset%d;}" % (i, i % 256) for i in range(100000)))
    out.add("rtf/switching.rtf", b"{\\rtf1{\\fonttbl{\\f0\\fcharset128;}{\\f1\\fcharset134;}}" + b"\\f0\\'81\\f1\\'81" * 200000)
    out.add("rtf/fields.rtf", b"{\\rtf1" + b"{\\info{\\author x}}" * 200000)
    out.add("rtf/word.rtf", b"{\\rtf1\\" + b"x" * (8 * MEGABYTE))
    out.add("rtf/time.rtf", RTF[:-1] + b"{\\info{\\creatim\\yr99999")
    out.add("rtf/surrogates.rtf", b"{\\rtf1" + b"\\u-10240?\\u-9216?\\u-9216?" * 100000)


def add_mail(out):
    head = b"From: a@example.org\r\nSubject: zeppelin\r\nMIME-Version: 1.0\r\n"
    nested = b"".join(b'Content-Type: multipart/mixed; boundary="b%d"\r\n\r\n--b%d\r\n' % (i, i) for i in range(10000))
    out.add("mail/nested.eml", head, nested, b"\r\nzeppelin")
    forwarded = b"Content-Type: message/rfc822\r\n\r\n" + head
    out.add("mail/forwarded.eml", head, forwarded * 10000, b"\r\nzeppelin")
    out.add("mail/parts.eml", head, b'Content-Type: multipart/mixed; boundary="b"\r\n\r\n', b"--b\r\n\r\nx\r\n" * 200000)
    out.add("mail/same_boundary.eml", head, b'Content-Type: multipart/mixed; boundary="b"\r\n\r\n--b\r\n' * 10000)
    out.add("mail/header.eml", b"Subject: ", *[b"x" * MEGABYTE] * 50, b"\r\n\r\nzeppelin")
    out.add("mail/headers.eml", b"X: y\r\n" * 500000, b"\r\nzeppelin")
    out.add("mail/folded.eml", b"Subject: x\r\n", b" y\r\n" * 500000, b"\r\nzeppelin")
    out.add("mail/people.eml", b"To: " + b"a@b, " * 200000 + b"\r\n\r\nzeppelin")
    out.add("mail/comments.eml", b"To: " + b"(" * 200000 + b"\r\n\r\nzeppelin")
    out.add("mail/groups.eml", b"To: " + b"g:" * 200000 + b"\r\n\r\nzeppelin")
    out.add("mail/words.eml", b"Subject: " + b"=?utf-8?q?=C3?= " * 200000 + b"\r\n\r\nzeppelin")
    out.add("mail/charset.eml", head, b"Content-Type: text/plain; charset=" + b"x" * 100000 + b"\r\n\r\n\xff\xfe")
    parameters = b"".join(b";\r\n name*%d=x" % i for i in range(20000))
    out.add("mail/parameters.eml", head, b"Content-Type: text/plain" + parameters + b"\r\n\r\nx")
    out.add("mail/box.mbox", b"From \n" * MEGABYTE)
    out.add("mail/letters.mbox", b"From a\nSubject: x\n\ny\n" * 200000)
    out.add("mail/line.mbox", b"From ", b"x" * (8 * MEGABYTE))
    out.add("mail/base64.eml", head, b"Content-Transfer-Encoding: base64\r\n\r\n", b"QUFB" * (2 * MEGABYTE))
    out.add("mail/uu.eml", head, b"Content-Transfer-Encoding: x-uuencode\r\n\r\nbegin 644 x\r\n", b"M" * (4 * MEGABYTE))
    out.add("mail/tail.eml", MAIL[:-9], b"\r\n--" * MEGABYTE)


def add_pdf(out):
    page = b"<</Type/Page/Parent 2 0 R/MediaBox[0 0 99 99]/Contents 4 0 R>>"
    flates = zlib.compress(zlib.compress(bytes(60 * MEGABYTE), 1), 1)
    hundred = b"BT(zeppelin)Tj ET"
    for _ in range(100):
        hundred = zlib.compress(hundred)
    trees = {"page_loop": {2: b"<</Type/Pages/Kids[2 0 R 3 0 R]/Count 9>>"},
             "parent_loop": {3: b"<</Type/Page/Parent 3 0 R/Contents 4 0 R>>"},
             "pages_claimed": {2: b"<</Type/Pages/Kids[3 0 R]/Count 10000000>>"},
             "pages_negative": {2: b"<</Type/Pages/Kids[3 0 R]/Count -2147483648>>"},
             "same_page": {2: b"<</Type/Pages/Kids[" + b"3 0 R " * 200000 + b"]/Count 200000>>"},
             "doubling": {2: b"<</Type/Pages/Kids[7 0 R 7 0 R]/Count 1000000>>"} | {
                 n: b"<</Type/Pages/Parent 2 0 R/Kids[%d 0 R %d 0 R]/Count 100000>>" % (n + 1, n + 1) for n in range(7, 30)}
             | {30: page},
             "array": {7: b"[" * 100000}, "dictionary": {1: b"<</Type/Catalog/Pages 2 0 R/X" + b"<</X" * 100000},
             "double_flate": {4: stream(flates, b"/Filter[/FlateDecode/FlateDecode]")},
             "hundred_flate": {4: stream(hundred, b"/Filter[" + b"/FlateDecode" * 100 + b"]")},
             "filters": {4: stream(b"x", b"/Filter[" + b"/ASCIIHexDecode" * 20000 + b"]")},
             "predictor": {4: stream(zlib.compress(bytes(99)), b"/Filter/FlateDecode/DecodeParms<</Predictor 15"
                                     b"/Columns 2147483647/Colors 2147483647/BitsPerComponent 16>>")},
             "length_loop": {4: b"<</Length 4 0 R>>stream\nBT(x)Tj ET\nendstream"},
             "filter_loop": {4: b"<</Length 9/Filter 4 0 R>>stream\nBT(x)Tj ET\nendstream"},
             "form_loop": {3: b"<</Type/Page/Parent 2 0 R/Contents 4 0 R/Resources 7 0 R>>",
                           4: stream(b"/X Do " * 50), 7: b"<</XObject<</X 8 0 R>>>>",
                           8: stream(b"/X Do " * 50, b"/Type/XObject/Subtype/Form/Resources 7 0 R")},
             "saves": {4: stream(b"q " * MEGABYTE)}, "text": {4: stream(b"BT/F 9 Tf" + b"(zeppelin)Tj " * 100000)},
             "places": {4: stream(b"BT/F 9 Tf" + b"".join(b"%d %d Td(z)Tj " % (i % 7, i % 5) for i in range(60000)))},
             "font": {5: b"<</Type/Font/Subtype/Type0/BaseFont/X/Encoding 7 0 R/DescendantFonts[5 0 R]>>",
                      7: stream(b"/CMapName/X 1 begincidrange<0000><ffffffff>0 endcidrange usecmap")},
             "font_file": {5: b"<</Type/Font/Subtype/TrueType/BaseFont/X/FontDescriptor<</FontFile2 7 0 R>>>>",
                           7: stream(b"\0\1\0\0\xff\xff" + bytes(range(256)) * 40)},
             "tounicode": {5: b"<</Type/Font/Subtype/Type1/BaseFont/X/ToUnicode 7 0 R>>",
                           7: stream(b"1 beginbfrange<00000000><7fffffff><0041> endbfrange " * 1000)},
             "info_loop": {6: b"<</Title 6 0 R/Author 6 0 R>>"},
             "metadata": {1: b"<</Type/Catalog/Pages 2 0 R/Metadata 7 0 R>>", 7: stream(BILLION + b"<rdf:li>&l9;</rdf:li>")},
             "packet": {1: b"<</Type/Catalog/Pages 2 0 R/Metadata 7 0 R>>",
                        7: stream(b"<dc:creator>" + b"<rdf:li>x</rdf:li>" * 200000)}}
    for filter_name in (b"JBIG2Decode", b"JPXDecode", b"DCTDecode", b"CCITTFaxDecode", b"LZWDecode", b"Crypt"):
        trees["garbage_" + filter_name.decode().lower()] = {4: stream(bytes(range(256)) * 99, b"/Filter/" + filter_name)}
    for name, objects in trees.items():
        out.add(f"pdf/{name}.pdf", pdf(objects))
    for name, trailer in {"encrypted": b"/Encrypt<</Filter/Standard/V 99/R 99/Length 2147483647/O()/U()/P 0>>",
                          "rounds": b"/Encrypt<</Filter/Standard/V 5/R 6/Length 256/O(%s)/U(%s)/OE(%s)/UE(%s)/P -1>>"
                                    % ((b"x" * 48,) * 2 + (b"x" * 32,) * 2),
                          "key_loop": b"/Encrypt 7 0 R", "size": b"/Size 2147483647", "prev": b"/Prev 9/XRefStm 9"}.items():
        out.add(f"pdf/{name}.pdf", pdf({7: b"7 0 R"}, trailer))
    whole = pdf()
    start = whole.rindex(b"startxref\n") + 10
    table = whole.rindex(b"xref\n0")
    out.add("pdf/xref_loop.pdf", pdf(trailer=b"/Prev %d" % whole.index(b"xref\n0")))
    out.add("pdf/xref_self.pdf", whole[:start], b"%d" % start, whole[start:])
    out.add("pdf/xref_count.pdf", whole[:table], b"xref\n0 2147483647\n", whole[table + 9:])
    out.add("pdf/xref_rows.pdf", whole[:table], b"xref\n2000000000 1\n0000000000 65535 f \n", whole[table + 9:])
    out.add("pdf/lost.pdf", b"%PDF-1.5\n", b"1 0 obj<<>>endobj\n" * 200000)
    out.add("pdf/starts.pdf", b"%PDF-1.5\n", b"startxref\n9\n%%EOF\n" * 200000)
    index = stream(b"7 0 1 0 " + b"<</Type/Catalog/Pages 2 0 R>>", b"/Type/ObjStm/N 2147483647/First 2147483647/Extends 7 0 R")
    cross = stream(bytes([2, 0, 7, 0]) * 9, b"/Type/XRef/W[1 2 1]/Size 9/Index[0 2147483647]/Root 1 0 R")
    out.add("pdf/object_stream_loop.pdf", pdf({7: index, 8: cross}, table=False).replace(b"startxref\n", b"startxref\n0"))
    huge = stream(b"x", b"/Type/XRef/W[2147483647 2147483647 1]/Size 2147483647/Root 1 0 R")
    out.add("pdf/xref_widths.pdf", b"%PDF-1.5\n1 0 obj", huge, b"endobj startxref 9\n%%EOF")


def add(out):
    add_markup(out)
    add_packages(out)
    add_compound(out)
    add_old_office(out)
    add_rich_text(out)
    add_mail(out)
    add_pdf(out)
