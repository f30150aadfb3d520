"""What office programs wrote before their files were containers in ZIP: DOC, XLS, PPT, RTF."""

DONORS = ["libnunit-doc", "libsmbios-doc", "libspreadsheet-parseexcel-perl", "libsoap-lite-perl", "astap",
          "tokyocabinet-doc", "libsystemc-doc", "preview.app", "librtf-writer-perl", "libdds-dev"]

WORD, SHEET, SLIDES = "application/msword", "application/vnd.ms-excel", "application/vnd.ms-powerpoint"
SAMPLES = "usr/share/doc/libspreadsheet-parseexcel-perl/examples/sample/Excel/"


def escaped(text, encoding):
    return "".join(f"\\'{byte:02x}" for byte in text.encode(encoding))


def documents(corpus):
    nunit, smbios = "usr/share/doc/nunit/html/files/", "usr/share/doc/libsmbios-doc/visio/"
    spanish = corpus.donor_bytes("libnunit-doc", nunit + "QuickStart.Spanish.doc.gz")
    words = ["Empecemos", "depósito", "InsufficientFundsException", "amarilla"]
    fields = {"KOVAMDTitle": "QuickStartSpanish", "KOVAMDAuthors": "Carlos Vinueza", "KOVAMDDescription": "NUnit",
              "KOVAMDContributors": "Charlie Poole", "KOVAMDNumberOfPages": "1"}
    corpus.add("old-word/cuenta.doc", spanish, words, fields, mime=WORD)
    corpus.add("old-word/cuenta.xls", spanish, words, fields)
    corpus.add("old-word/memory.doc", corpus.donor_bytes("libsmbios-doc", smbios + "Notes_on_CMOS_Access.doc.gz"),
               ["chipsets", "interrupts", "cease", "unexpected"], {"KOVAMDAuthors": "Bi-Chong Wang"}, mime=WORD)
    corpus.add("old-word/state.doc", corpus.donor_bytes(
        "libsmbios-doc", smbios + "SMBIOS_CMOS_State_Byte_Guidelines.doc.gz"),
        ["Appendices", "References", "Dell", "Future"], mime=WORD)


def sheets(corpus):
    def sample(name, path, words, fields):
        corpus.add(f"old-sheet/{path}", corpus.donor("libspreadsheet-parseexcel-perl", SAMPLES + name), words, fields,
                   mime=SHEET)

    numbers = ["漢字も入る", "漢字のデータ", "1964-03-23", "1234567.89012345", "1246912.89012345"]
    sample("Test97J.xls", "excel97.xls", numbers + ["123456789012"], {"KOVAMDAuthors": "Kawai, Takanori (Hippo2000)"})
    sample("Test95J.xls", "excel95.xls", numbers, {})
    sample("oem.xls", "characters.xls", ["文字化けするシリーズ", "ローマ字", "化ける"], {})
    # The text of a button.
    corpus.add("old-sheet/button.xls",
               corpus.donor("libsoap-lite-perl", "usr/share/doc/libsoap-lite-perl/examples/COM/states.xls"),
               ["Missouri", "localhost", "State", "Name"], {"KOVAMDAuthors": "Brian Jepson"}, mime=SHEET)
    # Of Excel 4, which is no compound file.
    corpus.add("old-sheet/excel4.xls", corpus.donor(
        "astap", "usr/share/doc/astap/examples/star_database_creation/1476 areas.xls"),
        ["StepsizeX", "5.14285714285714", "Declination", "average"], mime=SHEET)


def slides(corpus):
    corpus.add("old-slides/tokyo.ppt",
               corpus.donor_bytes("tokyocabinet-doc", "usr/share/doc/tokyocabinet-doc/tokyoproducts.ppt.gz"),
               ["Hirabayashi", "Dystopia", "portable", "innovating"], {"KOVAMDAuthors": "hirabayashi"}, mime=SLIDES)
    corpus.add("old-slides/transactions.ppt", corpus.donor(
        "libsystemc-doc", "usr/share/doc/libsystemc/examples/tlm/at_ooo/docs/at_ooo_example.ppt"),
        ["Donovan", "Illustrate", "SimpleBusAT", "begin_response_method"],
        {"KOVAMDTitle": "AT Basic System Example", "KOVAMDContributors": "Torsten Maehne",
         "KOVAMDOrganizations": "ESLX, Inc."}, mime=SLIDES)
    corpus.add("old-slides/manager.ppt",
               corpus.donor_bytes("libsmbios-doc", "usr/share/doc/libsmbios-doc/visio/libsmbios-manager.ppt.gz"),
               ["Confidential", "Extendibility", "viewpoint", "standardized"], {"KOVAMDAuthors": "Phaedra Cucina"},
               mime=SLIDES)


def rich_text(corpus):
    mime = "application/rtf"
    corpus.add("rtf/mac.rtf", corpus.donor(
        "preview.app", "usr/share/doc/preview.app/Contributors.rtf"),
        ["Drieu", "Gürkan", "Sengün", "Teunissen"], mime=mime)
    corpus.add("rtf/dame.rtf", corpus.donor(
        "librtf-writer-perl", "usr/share/doc/librtf-writer-perl/examples/la_dame.rtf"),
        ["fermé", "flétris", "Apollinaire", "Burke"], mime=mime)
    corpus.add("rtf/bridge.rtf", corpus.donor_bytes("libdds-dev", "usr/share/doc/libdds-dev/Alg-dds_x.rtf.gz"),
               ["Haglund", "Kupferschmid", "Joël", "Bradmetz"], mime=mime)
    russian = escaped("Последнее слово в примечании", "cp1251")
    corpus.add("rtf/russian.rtf", ("{\\rtf1\\ansi\\ansicpg1251{\\fonttbl{\\f0\\fcharset204 Arial;}}"
                                   "{\\info{\\title " + escaped("Отчёт", "cp1251") + "}}\\f0 " +
                                   escaped("Первая строка", "cp1251") + "{\\footnote " + russian + "}\\par}").encode(),
               ["Первая", "строка", "примечании"], {"KOVAMDTitle": "Отчёт"}, mime=mime)
    corpus.add("rtf/japanese.rtf", ("{\\rtf1\\ansi\\ansicpg1252{\\fonttbl{\\f0 Arial;}{\\f1\\fcharset128 MS Mincho;}}"
                                    "\\f0 Caf\\'e9 {\\f1 " + escaped("会議の記録", "cp932") + "}{\\uc2\\u26481" +
                                    escaped("東", "cp932") + "\\u20140" + escaped("京", "cp932") + "}\\par}").encode(),
               ["Café", "会議", "記録", "東京"], mime=mime)


def make(corpus):
    documents(corpus)
    sheets(corpus)
    slides(corpus)
    rich_text(corpus)
