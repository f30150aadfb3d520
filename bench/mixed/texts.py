"""What the generated files say: paragraphs of the machine's own documents, sentences in other languages, and words that
stand nowhere else."""

import os
import random

PARAGRAPHS_MAX = 20000
SYLLABLES = {
    "latin": ("bcdfgklmnprstvz", "aeiou"),
    "accents": ("bcčdfgklmnprsštvzž", "áéíóúäöü"),
    "cyrillic": ("бвгдклмнпрстчш", "аеиоуяю"),
    "greek": ("βγδκλμνπρστφχ", "αεηιουω"),
    "japanese": ("かきくさすせたてとなのはひふまみめやよらりれわ", "んうい"),
    "chinese": ("安百长达风光海金开林明年平青山水天文西星雪阳中", "城河湖江岭路门桥"),
}
SENTENCES = {
    "accents": "Příští týden začíná výstava starých map. Die Übergabe der Schlüssel erfolgt früh am Morgen. Le garçon a "
               "déjà reçu sa réponse à l'hôtel. La señora compró piñas y limón. W sobotę łódź płynie aż do źródła. ",
    "cyrillic": "В субботу утром поезд прибывает на главный вокзал. Документы лежат в верхнем ящике стола. Сегодня после "
                "обеда будет дождь, поэтому встреча переносится в библиотеку. Все подписи должны быть на последней "
                "странице договора. ",
    "greek": "Το πλοίο φεύγει από το λιμάνι νωρίς το πρωί. Τα έγγραφα βρίσκονται στο πάνω συρτάρι του γραφείου. Η "
             "συνάντηση θα γίνει στη βιβλιοθήκη μετά το μεσημέρι. ",
    "japanese": "列車は土曜日の朝に中央駅に着きます。書類は机の一番上の引き出しにあります。午後は雨が降るので、会議は図書館で"
                "行います。契約書の最後のページに署名してください。",
    "chinese": "火车星期六早上到达中央车站。文件放在桌子最上面的抽屉里。今天下午会下雨，所以会议改在图书馆举行。请在合同的"
               "最后一页签名。",
}


class Texts:
    """Deterministic for a seed and a machine."""

    def __init__(self, seed, source="/usr/share/doc"):
        self.random = random.Random(seed)
        self.paragraphs = _paragraphs(source)
        self.used = set()

    def word(self, script="latin"):
        """One that no other call returns."""
        consonants, vowels = SYLLABLES[script]
        while True:
            word = "".join(self.random.choice(consonants) + self.random.choice(vowels) for _ in range(4))
            if word not in self.used:
                self.used.add(word)
                return word

    def take(self, size):
        """Paragraphs of together about so many characters."""
        taken = []
        while size > 0:
            taken.append(self.random.choice(self.paragraphs))
            size -= len(taken[-1])
        return taken

    def with_word(self, size, word, script="latin"):
        """The same, with the word somewhere in the middle of them, among words of its own language."""
        if script == "latin":
            paragraphs = self.take(size)
            at = self.random.randrange(len(paragraphs))
            first, _, rest = paragraphs[at].partition(" ")
            paragraphs[at] = f"{first} {word} {rest}"
            return paragraphs
        sentences = SENTENCES[script]
        count = max(2, size // len(sentences))
        gap = "" if script in ("japanese", "chinese") else " "
        return [sentences] * (count // 2) + [sentences + word + gap + sentences] + [sentences] * (count // 2)


def _paragraphs(source):
    """Of the plain text below the folder, in the order of its paths."""
    found = []
    for where, folders, names in os.walk(source):
        folders.sort()
        for name in sorted(names):
            path = os.path.join(where, name)
            if os.path.splitext(name)[1] in (".gz", ".png", ".pdf", ".gif") or os.path.islink(path):
                continue
            with open(path, "rb") as file:
                data = file.read(65536)
            for part in data.split(b"\n\n"):
                text = " ".join(part.decode("ascii", "ignore").split())
                if 80 <= len(text) <= 1500 and b"<" not in part:
                    found.append(text)
            if len(found) >= PARAGRAPHS_MAX:
                return found
    return found or ["No document of this machine can be read, so all are like this one. " * 3]
