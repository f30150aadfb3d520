"""PDF by several programs, in several scripts, and encrypted."""

import hashlib

DONORS = ["debian-history", "ipadic-common", "fonts-sil-taiheritagepro", "cups-filters"]

PADDING = bytes.fromhex("28BF4E5E4E758A4164004E56FFFA01082E2E00B6D0683E802F0CA9FE6453697A")
PERMISSIONS = -4
FILE_ID = b"0123456789abcdef"


def rc4(key, text):
    state, j = list(range(256)), 0
    for i in range(256):
        j = (j + state[i] + key[i % len(key)]) % 256
        state[i], state[j] = state[j], state[i]
    out, i, j = bytearray(), 0, 0
    for byte in text:
        i = (i + 1) % 256
        j = (j + state[i]) % 256
        state[i], state[j] = state[j], state[i]
        out.append(byte ^ state[(state[i] + state[j]) % 256])
    return bytes(out)


def encrypted_pdf(text):
    """A page that anybody may open and nobody may change: encrypted with an empty password, 40 bits."""
    owner = rc4(hashlib.md5(PADDING).digest()[:5], PADDING)
    key = hashlib.md5(PADDING + owner + PERMISSIONS.to_bytes(4, "little", signed=True) + FILE_ID).digest()[:5]

    def sealed(number, content):
        return rc4(hashlib.md5(key + number.to_bytes(3, "little") + b"\0\0").digest()[:10], content)
    content = sealed(4, b"BT /F 12 Tf 72 720 Td (" + text + b") Tj ET")
    objects = [b"<</Type/Catalog/Pages 2 0 R>>", b"<</Type/Pages/Kids[3 0 R]/Count 1>>",
               b"<</Type/Page/Parent 2 0 R/MediaBox[0 0 612 792]/Contents 4 0 R/Resources<</Font<</F 5 0 R>>>>>>",
               b"<</Length %d>>stream\n%s\nendstream" % (len(content), content),
               b"<</Type/Font/Subtype/Type1/BaseFont/Helvetica>>",
               b"<</Filter/Standard/V 1/R 2/O<%s>/U<%s>/P %d>>" % (owner.hex().encode(),
                                                                   rc4(key, PADDING).hex().encode(), PERMISSIONS),
               b"<</Title<%s>>>" % sealed(7, b"Sealed letter").hex().encode()]
    out, offsets = b"%PDF-1.4\n", []
    for number, body in enumerate(objects, 1):
        offsets.append(len(out))
        out += b"%d 0 obj%s endobj\n" % (number, body)
    table = b"xref\n0 %d\n0000000000 65535 f \n" % (len(objects) + 1)
    table += b"".join(b"%010d 00000 n \n" % offset for offset in offsets)
    trailer = b"trailer<</Root 1 0 R/Size %d/Encrypt 6 0 R/Info 7 0 R/ID[<%s><%s>]>>\nstartxref\n%d\n%%%%EOF\n"
    return out + table + trailer % (len(objects) + 1, FILE_ID.hex().encode(), FILE_ID.hex().encode(), len(out))


def make(corpus):
    def add(path, package, source, words, **fields):
        names = {f"KOVAMD{name}": value for name, value in fields.items()}
        corpus.add(f"pdf/{path}", corpus.donor_bytes(package, source), words, names, mime="application/pdf")

    # Named encodings, without tables of their own, by a program of 2003.
    add("dictionary.pdf", "ipadic-common", "usr/share/doc/ipadic-common/ipadic-ja.pdf",
        ["奈良先端科学技術大学院大学", "浅原正幸", "ICOT", "exempted"],
        Creator="TeX output 2003.11.15:1551", NumberOfPages="48", PageWidth={"min": 595, "max": 595}, PageHeight={"min": 842, "max": 842}, Version="1.2")
    history = "usr/share/doc/debian-history/docs/project-history"
    add("history-ja.pdf", "debian-history", f"{history}.ja.pdf", ["小史", "利用者", "商業的", "宣言"],
        Title="Debian 小史", Creator="DBLaTeX-0.3.12", EncodingApplications="xdvipdfmx (20211117)", NumberOfPages="28")
    add("history-ru.pdf", "debian-history", f"{history}.ru.pdf", ["приобретение", "рационализировать", "Манифесте"],
        Title="Краткая история Debian", NumberOfPages="28", Version="1.5")
    add("form.pdf", "cups-filters", "usr/share/cups/data/form_russian.pdf",
        ["ИНФОРМАЦИЯ", "задания", "Системный", "печати"],
        Creator="Writer", EncodingApplications="LibreOffice 4.0", ContentCreationDate={"min": 1383213600, "max": 1383217300})
    add("fonts.pdf", "fonts-sil-taiheritagepro",
        "usr/share/doc/fonts-sil-taiheritagepro/documentation/developer/Future THP Modifications.pdf.gz",
        ["Dwarf", "glyph", "OptionalCombiningMarks", "substituted"],
        Title="Future THP Modifications", Authors="jbrase", Creator="PScript5.dll Version 5.2.2", NumberOfPages="5")
    corpus.add("pdf/sealed.pdf", encrypted_pdf(b"Nobody may change this zanzibar"), ["nobody", "change", "zanzibar"],
               {"KOVAMDTitle": "Sealed letter", "KOVAMDSecurityMethod": "Password Encrypted"}, mime="application/pdf")
    corpus.add("pdf/lying.jpg", corpus.donor("debian-history", f"{history}.ru.pdf"), ["Манифесте", "исключительно"],
               mime="application/pdf")
