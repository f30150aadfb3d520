#!/usr/bin/env python3
"""Fails on an include that points to the right: platform -> common -> sdk -> fileindex -> services, cli.

usage: include_rules.py SOURCE_FOLDER
"""
import pathlib
import re
import sys

LEVELS = {"platform": 0, "common": 1, "sdk": 2, "fileindex": 3, "services": 4, "cli": 4}
# Inside fileindex/ the headers have an order of their own.
HEADER_LEVELS = {"optree": 0, "util": 0, "queue_mgr": 1, "status_mgr": 1, "elastic/comm": 2, "elastic/elastic_control": 2,
                 "folder": 3, "folder_mgr": 3, "operation_steps": 4, "watch_list": 4, "related_services": 4,
                 "index_mgr": 4}
# Two sources reach right: a custom event needs the queue and, when it cannot be written, the share's status; a queue
# that is being read keeps the folders' configuration alive. The index daemon watches the host's own table of shares, the
# notification daemon reads the host's registry and settings, and the supervisor looks after its services. Frames are
# every implementation's, and who may have to give up a request needs the connection beneath.
EXCEPTIONS = {("fileindex/custom_event.cpp", "fileindex/queue_mgr.h"),
              ("fileindex/custom_event.cpp", "fileindex/status_mgr.h"),
              ("fileindex/queue_mgr.cpp", "fileindex/folder_mgr.h"),
              ("services/fileindexd/main.cpp", "platform/host/share_table.h"),
              ("services/kovanotifyd/main.cpp", "platform/host/configuration.h"),
              ("services/kovanotifyd/main.cpp", "platform/host/notify_registry.h"),
              ("services/fileindexd/main.cpp", "platform/host/mounts.h"),
              ("services/fileindexd/interruption.h", "platform/base/frames.h"),
              ("services/support/local_request.cpp", "platform/base/frames.h"),
              ("services/supervisor/main.cpp", "platform/host/service_log.h"),
              ("services/supervisor/main.cpp", "platform/host/child_service.h")}
# The tool keeps the table of shares, tells what is wrong in it or why a service did not start, and knows mount points.
TOOL_MAY = {f"platform/host/{name}.h" for name in ("share_table", "share_rules", "mounts", "child_service")}


def points_right(file, include):
    if file.parts[0] == "platform" and include.startswith("platform/"):
        return False
    if file.parts[0] == "cli" and include in TOOL_MAY:
        return False
    if include.startswith("platform/"):
        return True  # the others know <kova/...> alone, never an implementation
    if LEVELS[include.split("/")[0]] > LEVELS[file.parts[0]]:
        return True
    own, other = (HEADER_LEVELS.get(re.sub(r"^fileindex/|\.\w+$", "", name)) for name in (str(file), include))
    if "/".join(file.parts[:1]) == "fileindex" and file.name == "custom_event.cpp":
        own = HEADER_LEVELS["util"]
    return own is not None and other is not None and other > own


def main(source_folder):
    root = pathlib.Path(source_folder)
    wrong, used, count = [], set(), 0
    for path in sorted(p for level in LEVELS for p in (root / level).rglob("*") if p.suffix in (".h", ".cpp")):
        file = path.relative_to(root)
        for include in re.findall(r'^\s*#\s*include\s+"([^"]+)"', path.read_text(), re.M):
            count += 1
            if include.split("/")[0] not in LEVELS:
                wrong.append(f"{file}: \"{include}\" is not given from the top folder")
            elif (str(file), include) in EXCEPTIONS:
                used.add(include)
            elif points_right(file, include):
                wrong.append(f"{file} must not include {include}")
    print("\n".join(wrong) if wrong else f"{count} includes, none points to the right")
    return 1 if wrong or count < 50 else 0


sys.exit(main(sys.argv[1]))
