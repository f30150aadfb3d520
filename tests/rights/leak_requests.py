"""The requests of leak_proof.py: all kinds of the language, of the orders and of the refusals, as (command, data)."""

import random

CONDITIONS = ("ext:txt", "ext:txt,md", "-ext:txt", "kind:folder", "kind:document", "kind:other", "kind:image,video",
              "size:>=0", "size:>100", "size:1..80", "size:0", "date:2018", "date:>2017-12-01", "date:2017-08..2018-01",
              "date:7d", "owner:0", "owner:50001", "owner:50002", "group:60002", "group:0", "type:text/html",
              "from:ada", "to:bob", "subject:{a}", "title:{a}", "title:{b}", "name:{a}", "name:s", "content:{a}",
              "path:\"{share}\"", "path:\"{share}/{a}\"", "path:\"{share}/secret0\"", "path:\"{share}/secret1\"",
              "path:\"{share}/dark\"", "path:\"{share}/nothing\"", "path:/", "path:/docs/{a}", "path:/docs/secret0", "path:/hidden",
              "path:\"{share}/past\"", "-absentword",
              "KOVAMDSubject:{a}", "KOVAMDTitle:\"{a} {b}\"", "year:1990..2020", "pages:>1", "width:>=1")
WORDS = ("{a}", "{a} {b}", "{a} {b} {c}", "\"{a} {b}\"", "{a}*", "{p}*", "\"{a} {p}\"*", "{a} OR {b}", "{a} -{b}",
         "({a} OR {b}) -{c}", "NOT {a}", "{t}", "{t} OR {a}", "-{t}", "{a} -{t}", "{t}*", "{tp}*", "\"{t} {a}\"", "{m}",
         "{m} {a}", "{a} ext:txt", "{a} size:>50", "{a} path:\"{share}/{b}\"", "{a} owner:50001", "{a}{b}", "{a}.{b}",
         "onceopen", "nowhereword", "once", "past", "{w}", "{v}", "name:{v} {a}", "*{t}*", "-{v}", "*",
         "Kündigung", "Frist {a}", "Mietvertrag", "Vertrag", "Kaution {t}")
REFUSED = ("(", "\"{a}", "a*", "OR", "size:many", "date:2018-13", "name:", "{a} OR", "((((((((((((((((({a})", "kind:",
           "x" * 5000, " ".join(["{a}"] * 80))
PATHS = ("{share}/secret0/0", "{share}/dark", "{share}/secret1", "{share}/nothing", "{share}", "{share}/..", "/etc/passwd",
         "{share}/{x}", "{share}/{x}/once.txt", "{share}/{x}/known.txt", "/docs/{x}/known.txt", "/docs/secret0", "/docs/{x}", "/hidden", "/hidden/{x}.txt", "/none/{x}.txt",
         "relative", "")
COMMANDS = ("index_list", "index_stat", "index_delete", "index_share", "document_get_by_query", "document_del_by_id", "commit",
            "access_set", "update_term_suggestion", "shares", "fresh", "status", "no_such_command")


def requests(share, own, theirs):
    rng = random.Random(7)
    found = []

    def search(query, **data):
        a, b, c = rng.sample(own, 3)
        t = rng.choice(theirs)
        text = query.format(a=a, b=b, c=c, t=t, p=a[:2], tp=t[:3], m=a[:-1] + "x", tm=t[:-1] + "x", share=share,
                            w=a[0] + "?" + a[2:], v=t[:3] + "*" + t[-1])
        found.append(("search", {"query": text, **data}))

    for _ in range(5):
        for query in WORDS:
            search(query, shares=["docs"])
    for query in CONDITIONS:
        search(query, limit=1000)
        search(query + " {a}", shares=["docs"], sort="name")
    for sort in ("relevance", "date", "name", "size"):
        for order in ("asc", "desc"):
            for query in ("size:>=0", "{p}*", "{a} OR {t}", "kind:folder", "-{t}"):
                for offset, limit in ((0, 20), (20, 20), (117, 50), (0, 1000), (99999, 1), (5, 0)):
                    search(query, sort=sort, order=order, offset=offset, limit=limit)
    for query in ("{a} {b} {t}", "{a} {t}", "{t} {tp}x", "{m} {b}", "+{a} {t}", "Frist Miete", "{a} {b} -{c}"):
        for data in ({"all_words": True}, {"explain": True, "limit": 100}, {"all_words": True, "sort": "date", "explain": True}):
            search(query, **data)
    for query in REFUSED:
        search(query)
    for shares in (["hidden"], ["none"], ["docs", "hidden"], ["docs", "other"], ["other"], [], "docs", [""], ["docs", "none"]):
        search("{a}", shares=shares)
    search("{a}", id="fileindex_docs")
    search("{a}", ids=["fileindex_docs", "fileindex_hidden"])
    search("{a}", limit=100000)
    search("{a}", snippet=False)
    for query in ("{a} {b} {c}", "{m} {a}", "{tm}", "{tm} {a}", "{a} {t}", "secret0 {a}", "dark", "{a} | {b}", "{a} +{t}"):
        search(query, explain=True)
        search(query, all_words=True, limit=100)
    search("{a}", mark_start="<", mark_end=">")
    for path in PATHS:
        for more in ({}, {"text": True}):
            found.append(("show", {"path": path.format(share=share, x=own[0]), **more}))
    for command in COMMANDS:
        found.append((command, {}))
        found.append((command, {"id": "fileindex_docs", "shares": ["docs", "hidden"], "timeout_ms": 20000}))
    for part in sorted({p[:2] for p in own} | {p[:3] for p in theirs}):
        found.append(("complete", {"text": part}))
    return found
