#!/usr/bin/env python3
"""Fails when libfileindex.so shows a symbol that no public header declares, or hides one of those named below.
The entry points of the management are not named: without any of them fileindexctl cannot be linked.

usage: exported_symbols.py LIBRARY HEADER_FOLDER
Instantiations of the standard library's templates are let pass: every shared library has some.
"""
import pathlib
import re
import subprocess
import sys

EXPECTED = ["ferrox::Error::what() const", "ferrox::LockFile::~LockFile()", "ferrox::sdk::SDKMutex()",
            "ferrox::SendCommandToDaemon(", "ferrox::fileindex::AddCustomEvent(", "typeinfo for ferrox::Error",
            "typeinfo for ferrox::SubjectError", "typeinfo for ferrox::fileindex::OperationError",
            "ferrox::fileindex::StatusMgr::Pause(int)", "ferrox::fileindex::elastic::SendRequestImpl(",
            "ferrox::fileindex::OPTree::ProcessOP(", "ferrox::fileindex::QueueMgr::PrepareTmpQueue()",
            "ferrox::fileindex::FolderMgr::Upsert(", "ferrox::fileindex::FolderMgr::GetMostSuitableCfg(",
            "ferrox::fileindex::FolderMgr::FolderMgr()", "ferrox::fileindex::Folder::GetStatus(",
            "ferrox::fileindex::log_level"]
STANDARD = re.compile(r"^(\S+ )*?(typeinfo (name )?for |vtable for |guard variable for )?(std::|__gnu_cxx::|operator)")
INTERNAL_HEADERS = {"custom_event.h", "file_types.h", "folder_rule.h", "folder_share.h", "operation_steps.h", "related_services.h"}


def main(library, header_folder):
    listing = subprocess.run(["nm", "-DC", "--defined-only", library], check=True, capture_output=True, text=True).stdout
    symbols = [line.split(" ", 2)[2] for line in listing.splitlines()]
    headers = [h for top in ("common", "sdk", "fileindex") for h in (pathlib.Path(header_folder) / top).rglob("*.h")]
    declared = "\n".join(re.sub(r"//.*", "", h.read_text()) for h in headers if h.name not in INTERNAL_HEADERS)
    words = set(re.findall(r"~?\w+(?=\()|(?<=class FERROX_EXPORT )\w+|(?<=struct FERROX_EXPORT )\w+|\w+(?=;)", declared))
    unexpected = []
    for symbol in symbols:
        name = re.sub(r"^(typeinfo( name)? for|vtable for|guard variable for) ", "", symbol)
        ours = re.search(r"(?:^|[ *&])ferrox::(?:\w+::)*(~?\w+)", re.sub(r"\(.*|<.*", "", name))
        known = ours and (ours[1] in words or symbol.endswith("operator<<"))
        if not known and not STANDARD.match(symbol) and "operator<<" not in symbol:
            unexpected.append(symbol)
    missing = [e for e in EXPECTED if not any(s.startswith(e) for s in symbols)]
    for symbol in unexpected:
        print("shown, but in no public header:", symbol)
    for symbol in missing:
        print("hidden:", symbol)
    print(len(symbols), "symbols")
    return 1 if unexpected or missing else 0


sys.exit(main(*sys.argv[1:]))
