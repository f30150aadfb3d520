#!/usr/bin/env python3
"""Fails on an include that the layout forbids: each room may include itself and the rooms listed for it, nothing else.

usage: include_rules.py SOURCE_FOLDER
"""
import pathlib
import re
import sys

# A room is the deepest of these folders that a file lies in.
LIBRARY = ["base", "common", "sdk", "wire", "fileindex", "fileindex/queue", "fileindex/optree", "fileindex/folders",
           "fileindex/elastic", "fileindex/operations"]
MAY = {
    "base": [],
    "platform/include": ["base"],
    "platform/shared": ["base"],
    "platform/host": ["base", "platform/shared"],
    "common": ["base"],
    "sdk": ["base", "common"],
    "wire": ["base", "common"],
    "fileindex": LIBRARY[:4],
    "fileindex/queue": LIBRARY[:5],
    "fileindex/optree": LIBRARY[:6],
    "fileindex/folders": LIBRARY[:7],
    "fileindex/elastic": LIBRARY[:5],
    "fileindex/operations": LIBRARY,
    "services/support": LIBRARY,
    "cli": LIBRARY + ["services/support"],
}
DAEMONS = ("fileindexd", "kova-access", "kova-accounts", "kovacontentextractd", "kovaelasticd", "kovanotifyd", "kovawebd", "supervisor")
MAY |= {f"services/{name}": LIBRARY + ["services/support"] for name in DAEMONS}
# The engine's rooms, each of which may include those before it.
ENGINE = [f"services/kovaelasticd/{name}" for name in ("text", "query", "store", "search", "indices", "commands")]
MAY |= {room: MAY["services/kovaelasticd"] + ENGINE[:at] for at, room in enumerate(ENGINE)}
MAY["services/kovaelasticd"] = MAY["services/kovaelasticd"] + ENGINE[-1:]
# The installed paths of headers that lie in a room, here and in the programs that use the library.
FORWARDING = {f"fileindex/{name}.h" for name in ("folder", "folder_mgr", "index_mgr", "optree", "queue_mgr", "watch_list")}
FORWARDING |= {"common/unique_fd.h", "common/scope_exit.h", "platform/include/kova/text.h", "fileindex/elastic/fields.h"}
# What reaches further, and why.
EXCEPTIONS = {
    # A queue is read into a tree, and one that is searched keeps the folders loaded.
    "fileindex/queue/queue_mgr.cpp": ["fileindex/optree/optree.h", "fileindex/folders/folder_mgr.h"],
    # The documents that the platform makes of files have the fields of the index; the header is names alone.
    "platform/host/content/facts.cpp": ["wire/fields.h"],
    "platform/host/content/parse_file.cpp": ["wire/fields.h"],
    "platform/host/content/extract_client.cpp": ["wire/fields.h"],
    # The daemons' main functions know the host that they run on: its table of shares, its registry, its services.
    "services/fileindexd/main.cpp": ["platform/host/samba_shares.h", "platform/host/share_search.h",
                                     "platform/host/mounts.h", "platform/host/exclusion_settings.h"],
    "services/kovaelasticd/main.cpp": ["platform/host/account_lookup.h", "platform/host/synonyms.h"],
    "services/kova-access/main.cpp": ["platform/host/synonyms.h", "platform/host/trusted_clients.h"],
    "services/kovanotifyd/main.cpp": ["platform/host/configuration.h", "platform/host/notify_registry.h"],
    "services/kovawebd/main.cpp": ["platform/host/configuration.h"],
    "services/supervisor/main.cpp": ["platform/host/service_log.h", "platform/host/child_service.h"],
}
# The tool keeps the table of shares, tells what is wrong in it, in the synonyms or why a service did not start, knows
# mount points, and shows what is left out.
TOOL_MAY = {f"platform/host/{name}.h" for name in ("share_table", "share_rules", "mounts", "child_service",
                                                    "exclusion_settings", "synonyms")}


def room_of(path):
    return max((room for room in MAY if path.startswith(room + "/")), key=len, default=None)


def is_allowed(file, include):
    room, other = room_of(file), room_of(include)
    if other == room or other in MAY[room]:
        return include not in FORWARDING or file in FORWARDING
    return include in EXCEPTIONS.get(file, []) or (room == "cli" and include in TOOL_MAY) or file in FORWARDING


def main(source_folder):
    root = pathlib.Path(source_folder)
    tops = sorted({room.split("/")[0] for room in MAY})
    wrong, count = [], 0
    for path in sorted(p for top in tops for p in (root / top).rglob("*") if p.suffix in (".h", ".cpp")):
        file, text = str(path.relative_to(root)), path.read_text()
        if room_of(file) == "base" and "#include <kova/" in text:
            wrong.append(f"{file} must not know the platform")
        for include in re.findall(r'^\s*#\s*include\s+"([^"]+)"', text, re.M):
            count += 1
            if not (root / include).is_file():
                wrong.append(f"{file}: \"{include}\" is not given from the top folder")
            elif not is_allowed(file, include):
                wrong.append(f"{file} must not include {include}")
    reached = [(file, include) for file, includes in EXCEPTIONS.items() for include in includes]
    wrong += [f"{file} does not include {include}: drop the exception" for file, include in reached
              if not (root / file).is_file() or f'"{include}"' not in (root / file).read_text()]
    print("\n".join(wrong) if wrong else f"{count} includes, each allowed")
    return 1 if wrong or count < 50 else 0


if __name__ == "__main__":
    sys.exit(main(sys.argv[1]))
