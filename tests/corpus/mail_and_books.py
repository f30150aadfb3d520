"""Mail with its parts, boxes of mail, pages saved in one file, and e-books."""

DONORS = ["mailman3", "fuzzyocr", "libmime-explode-perl", "inetsim", "python3-networkx", "python3-dkim", "libdds-dev",
          "debian-history", "debian-edu-doc-legacy-ja"]

MESSAGES = "usr/share/doc/libmime-explode-perl/examples/testmsgs/"
AUDACITY = "usr/share/doc/debian-edu-doc-legacy-ja/audacity-manual.epub"
MAIL, BOX, BOOK = "message/rfc822", "application/mbox", "application/epub+zip"


def mail(corpus):
    def add(path, package, source, words, mime=MAIL, error=None, **fields):
        corpus.add(f"mail/{path}", corpus.donor_bytes(package, source), words,
                   {f"KOVAMD{name}": value for name, value in fields.items()}, mime=mime, error=error)

    mailman = "usr/lib/python3/dist-packages/mailman/"
    add("letters.eml", "mailman3", mailman + "handlers/tests/data/msg_rfc822.eml", ["Plain", "body", "Attached"],
        Title="Message Subject", Authors="User", AuthorAddresses="user@example.com", Recipients="Someone",
        ContentCreationDate=1302227690, Identifier="4D9E6AEA.1060802@example.net",
        error="partly read: not the messages deep within others")
    add("alternatives.eml", "mailman3", mailman + "handlers/tests/data/c_a_non_ascii.eml",
        ["Body", "can’t", "won’t"], Title="[pycon-aid] spammer", AuthorAddresses="office@example.com")
    add("croatian.eml", "mailman3", mailman + "chains/tests/issue144.eml", ["Ignore", "Višenamjenski"],
        Title="Višenamjenski pištolj za vodu 8/1")
    add("czech.eml", "mailman3", mailman + "handlers/tests/data/html_non_ascii.eml", ["formát", "zprávy", "Hahaha"],
        AuthorAddresses="aperson@example.com")
    add("russian.eml", "mailman3", mailman + "email/tests/data/bad_email.eml",
        ["рекламная", "рассылка", "отклик", "клиентов"], RecipientAddresses="test@example.com")
    # Its plain form says other, and less, than its form in HTML.
    add("picture.eml", "fuzzyocr", "usr/share/doc/fuzzyocr/examples/ocr-gif.eml",
        ["slumbering", "caverns", "bashful", "sbillet"], Title="To take on supplier", Authors="Clifton Ballard",
        ContentCreationDate=1155000044)
    # By their content: nothing in these names says that they are mail.
    add("german.msg", "libmime-explode-perl", MESSAGES + "german.msg",
        ["entschuldigen", "Verfügung", "Kundennachfragen", "rauszufinden"], Title="Re: 34Mbit/s Netz",
        Authors="Guenter Deuschle", EncodingApplications="Windows Eudora Version 1.4.4")
    add("1532342.M1.host:2,S", "libmime-explode-perl", MESSAGES + "multi-nested.msg",
        ["outer", "preceding", "typing"], Title="A complex nested multipart example", Authors="Lord John Whorfin")
    add("Inbox", "libmime-explode-perl", MESSAGES + "ak-0696.msg", ["KULTURBOX", "telefonisch", "Hannover"],
        mime=BOX, AuthorAddresses="specht@kulturbox.de")
    add("makefile.eml", "libmime-explode-perl", MESSAGES + "multi-igor.msg", ["Parser", "Igor", "Synapse"],
        Title="Need help", Authors="Starovoitov Igor")
    add("dinner.eml", "python3-dkim", "usr/lib/python3/dist-packages/dkim/tests/data/rfc6376.msg",
        ["hungry", "game", "Joe"], Title="Is dinner ready?", Recipients="Suzie Q")
    add("spam.mbox", "inetsim", "usr/share/inetsim/data/pop3/spam.mbox",
        ["masterpiece", "casino", "Dongguan", "paidup"], mime=BOX)
    add("sample.mbox", "inetsim", "usr/share/inetsim/data/pop3/sample.mbox", ["INetSim", "attachment", "POP3"],
        mime=BOX, Authors="Sample User")
    add("friends.mbox", "python3-networkx", "usr/share/doc/python3-networkx/examples/drawing/unix_email.mbox",
        ["NetworkX", "Konigsburg", "laptops", "lunch"], mime=BOX)
    add("library.mht", "libdds-dev", "usr/share/doc/libdds-dev/DLL-dds_x.mht.gz",
        ["Haglund", "Callable", "functions", "Solver"], mime="multipart/related")


def books(corpus):
    def history(language, words, title, description):
        corpus.add(f"book/{language}.epub", corpus.donor(
            "debian-history", f"usr/share/doc/debian-history/docs/project-history.{language}.epub"), words,
            {"KOVAMDTitle": title, "KOVAMDDescription": description}, mime=BOOK)
    history("ko", ["미첼마이어", "초록", "프로젝트의", "머독"], "간단한 데비안 역사",
            "이 문서는 데비안 프로젝트의 역사와 목표를 기술한다.")
    history("ja", ["務めました", "歴史", "目標"], "Debian 小史",
            "この文書は、Debian プロジェクトの歴史と目標について述べます。")
    history("ru", ["возглавлял", "Мэрдок", "Аннотация", "Шульц"], "Краткая история Debian",
            "Этот документ рассказывает об истории и целях проекта Debian.")
    # Packed with its folder, so that nothing is where it must be.
    corpus.add("book/packed-with-folder.epub", corpus.donor_bytes("debian-edu-doc-legacy-ja", AUDACITY),
               ["マニュアル", "翻訳", "アップロード"], {"KOVAMDTitle": "Debian Edu / Skolelinux Audacity マニュアル"},
               mime=BOOK)


def make(corpus):
    mail(corpus)
    books(corpus)
