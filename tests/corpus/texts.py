"""Plain text in the encodings that people have, source, CSV, Markdown, HTML and XML."""

import re

DONORS = ["debian-history", "libspreadsheet-writeexcel-perl", "r-cran-readxl", "xfig-doc",
          "xlsx2csv"]

DEDICATIONS = "usr/share/doc/debian-history/dedication/"
POEMS = "usr/share/doc/libspreadsheet-writeexcel-perl/examples/"
XFIG = "usr/share/doc/xfig/html/japanese/"

POPULATION = "Stadt;Einwohner\nKöln;1087863\nMünchen;1512491\nGöttingen;116557\n"
CITIES = "城市,人口,省份\n广州,18676605,广东省\n哈尔滨,10009854,黑龙江省\n乌鲁木齐,4054369,新疆维吾尔自治区\n"


def in_encodings(corpus):
    def dedication(name, path, words, change=lambda text: text):
        corpus.add(f"text/{path}", change(corpus.donor_bytes("debian-history", f"{DEDICATIONS}dedication-{name}.txt")),
                   words, mime="text/plain")

    def poem(name, path, words):
        corpus.add(f"text/{path}", corpus.donor_bytes("libspreadsheet-writeexcel-perl", f"{POEMS}{name}.txt"), words,
                   mime="text/plain")

    dedication("2.2.ja", "euc-jp.txt", ["死期", "偉大な業績", "開発者一同", "武藤"])
    dedication("2.2.cn", "gbk.txt", ["专业水平", "疾病重负", "贡献", "激励"])
    dedication("2.2.fi", "latin1.txt", ["epäillä", "ystävyytensä", "kehittäjät", "inspiroivan"])
    dedication("9.0.ru", "utf-8.txt", ["Иэна", "дистрибутивов", "посвящаем", "Разработчики"])
    dedication("9.0.th", "utf-8-mark.txt", ["เดเบียน", "ดิสทริบิวชัน", "เอียน", "stretch"], lambda text: b"\xef\xbb\xbf" + text)
    dedication("5.0.cs", "utf-16.txt", ["Thiemova", "přínos", "jádra", "věnovat"],
               lambda text: text.decode().encode("utf-16"))
    dedication("9.0.ta", "utf-16be-unmarked", ["டெபியன்", "உத்வேகமாக", "அர்ப்பணிக்கிறோம்", "350"],
               lambda text: text.decode().encode("utf-16-be"))
    poem("unicode_shift_jis", "shift-jis.txt", ["光源", "ダイクロイックミラーランプ", "アルマイト", "トランス込"])
    poem("unicode_big5", "big5.txt", ["老子", "下德不失德", "失道而后德", "大丈夫"])
    poem("unicode_koi8r", "koi8-r.txt", ["мучительные", "степи", "сгорел", "февраля"])
    poem("unicode_cp1251", "windows-1251.txt", ["Мело", "мошкора", "башмачка", "скрещенья"])
    poem("unicode_8859_11", "thai.txt", ["สยาม", "ทองแดง", "Bhumibol", "สงคราม"])
    poem("unicode_cp1256", "arabic.txt", ["الاسلام", "رمضان", "والطبراني", "لهيعة"])
    korean = "한국어 문서 시험입니다.\n" + "데비안 프로젝트의 역사와 목표를 기술한다.\n" * 5 + "마지막 줄에는 고구마가 있다.\n"
    corpus.add("text/euc-kr.txt", korean.encode("euc-kr"), ["문서", "데비안", "목표", "고구마"], mime="text/plain")


def source_and_tables(corpus):
    corpus.add("source/latin1.pl", corpus.donor("libspreadsheet-writeexcel-perl", f"{POEMS}function_locale.pl"),
               ["McNamara", "NORMIT", "KÄÄNT", "ÄRSAKNAD"], mime="text/x-perl")
    corpus.add("source/xlsx2csv.py", corpus.donor("xlsx2csv", "usr/share/xlsx2csv/xlsx2csv.py"),
               ["expat", "skip_empty_lines", "SharedStrings", "SheetNotFoundException"], mime="text/x-python")
    corpus.add("source/ocr.log", "2024-05-01 12:00:00 größe überschritten: Straßenbahn\n".encode("latin1"),
               ["größe", "Straßenbahn"], mime="text/plain")
    corpus.add("csv/semicolons.csv", POPULATION.encode("latin1"), ["Einwohner", "Köln", "1512491", "Göttingen"],
               mime="text/csv")
    corpus.add("csv/gbk.csv", CITIES.encode("gb18030"), ["广州", "人口", "10009854", "新疆维吾尔自治区"], mime="text/csv")
    corpus.add("csv/sheets.csv", corpus.donor("xlsx2csv", "usr/share/doc/xlsx2csv/examples/test/sheets.csv"),
               ["Реестр", "Заказчик", "Шаблон", "сценария"], mime="text/csv")
    corpus.add("markdown/news.md", corpus.donor("r-cran-readxl", "usr/lib/R/site-library/readxl/NEWS.md"),
               ["sprintf", "Alpine", "x005F", "jmarshallnz"], mime="text/markdown")
    corpus.add("markdown/xlsx2csv.md", corpus.donor_bytes("xlsx2csv", "usr/share/doc/xlsx2csv/README.md"),
               ["dateformat", "ignoreempty", "sheetdelimiter", "delimiter"], mime="text/markdown")
    corpus.add("markdown/deutsch.md", "# Überschrift\n\n* Käse\n* Brötchen\n\n```\nlet täglich = 1;\n```\n".encode(),
               ["Überschrift", "Käse", "Brötchen", "täglich"], mime="text/markdown")


def pages(corpus):
    page = corpus.donor_bytes("xfig-doc", f"{XFIG}introduction.html").decode()
    bare = re.sub(r"<META HTTP-EQUIV[^>]*>", "", page)
    words = ["対話的", "描画", "矩形", "スプライン曲線"]
    corpus.add("html/declared.html", page.encode(), words, {"KOVAMDTitle": "Introduction"}, mime="text/html")
    corpus.add("html/undeclared-euc-jp.html", bare.encode("euc-jp", "ignore"), words, {"KOVAMDTitle": "Introduction"},
               mime="text/html")
    corpus.add("html/wrongly-declared.html", page.replace("charset=UTF-8", "charset=iso-8859-1").encode(), words,
               {"KOVAMDTitle": "Introduction"}, mime="text/html")
    picture = "A" * 300000
    corpus.add("html/saved-page.html", f"<html><head><title>Reise</title><link href=\"data:text/css,{picture}'{picture}\">"
               "</head><body><p title=it's>Der Zug nach T&uuml;bingen<img alt=\"Bahnhof\" src='data:image/png;base64,"
               f"{picture}'>f&auml;hrt <b>p</b>ünktlich</body></html>".encode(),
               ["Tübingen", "fährt", "pünktlich"], {"KOVAMDTitle": "Reise"}, mime="text/html")
    corpus.add("xml/notes.xml", '<?xml version="1.0" encoding="windows-1251"?><notes><note>Быстрая лисица</note>'
               "<note><![CDATA[прыгает]]> &#x447;ерез</note></notes>".encode("cp1251"),
               ["Быстрая", "лисица", "прыгает", "через"], mime="application/xml")
    corpus.add("xml/page-without-extension", b"\n<!DOCTYPE html><title>Hidden page</title><p>nothing named it</p>",
               ["Hidden", "nothing", "named"], mime="text/html")
    corpus.add("xml/report.doc", "\ufeff<html xmlns:o='urn:x'><head><title>Quartalsbericht</title></head><body><table>"
               "<tr><td>Umsatz</td><td>Erlös</td></tr></table></body></html>".encode(),
               ["Quartalsbericht", "Umsatz", "Erlös"], mime="text/html")


def make(corpus):
    in_encodings(corpus)
    source_and_tables(corpus)
    pages(corpus)
