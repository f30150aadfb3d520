"""Plain text in the encodings that people have, source, CSV and Markdown."""

DONORS = ["libuchardet-dev"]


def make(corpus):
    corpus.add("text/utf8.txt", "Zażółć gęślą jaźń\nпоследнее слово\n".encode(), ["gęślą", "слово"], mime="text/plain")
