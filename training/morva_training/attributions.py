"""Writes the list of recordings' sources, licences and authors that the models were trained on.

Authors are named wherever a licence asks for it; public-domain and CC0 sources are named, too, as
collections.
"""

from __future__ import annotations

import argparse
import re
from collections import defaultdict
from pathlib import Path

from .corpus import read_manifest

KINDS = {"speech": "Speech", "noise": "Noise", "rir": "Room responses"}
FREE = re.compile(r"^(CC0|public domain|US public domain|Creative Commons 0)", re.IGNORECASE)

SPEECH_CREDITS = """
### Authors, speech

- LibriSpeech (CC BY 4.0): V. Panayotov, G. Chen, D. Povey, S. Khudanpur; read by LibriVox volunteers.
- VCTK corpus (CC BY 4.0): C. Veaux, J. Yamagishi, K. MacDonald, University of Edinburgh; without p232 and p257.
- speechocean762: J. Zhang and others, SpeechOcean and Xiaomi.
- GCompris voices (CC BY-SA): the GCompris project and its speakers.
- Arabic speech commands (CC BY 4.0): A. Ghandoura, F. Hjabo, O. Al Dakkak.
- Speech-to-intent and wake-word recordings (Apache-2.0): Picovoice Inc. and its speakers; Lyra's test data: Google.
- Artikulate courses (CC BY-SA 3.0): D. Kardarakos (Greek), O. Gupta (Bengali).
- Toki Pona words (CC BY-SA): kala Asi; OpenDungeons voices (CC BY-SA 3.0): eugeneloza.
- Kathleen, Kerstin, Nathalie, Thorsten, OHF voice samples, EmoDB (CC0) and the modified rhyme test recordings of NIST
  (public domain) ask for no mention and have earned it.
"""


def section(kind: str, rows: list[dict[str, str]]) -> list[str]:
    """Markdown lines for one manifest, training split only."""
    groups: dict[tuple[str, str], list[dict[str, str]]] = defaultdict(list)
    for row in rows:
        if row.get("split", "train") == "train":
            groups[(row["source"], row["licence"])].append(row)
    lines = [f"\n## {KINDS[kind]}\n", "| source | licence | recordings |", "|---|---|---|"]
    credits: list[str] = []
    for (source, licence), members in sorted(groups.items()):
        lines.append(f"| {source} | {licence} | {len(members)} |")
        authors = sorted({m.get("author", "").strip() for m in members} - {"", "-"})
        if authors and not FREE.match(licence):
            credits.append(f"**{source}** ({licence}): " + "; ".join(authors) + "\n")
    return lines + ([f"\n### Authors, {KINDS[kind].lower()}\n", *credits] if credits else [])


def main() -> None:
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("--data", type=Path, required=True)
    parser.add_argument("--out", type=Path, required=True)
    args = parser.parse_args()
    lines = [
        "# Recordings the models were trained on\n",
        "The weight files were trained on mixtures of the recordings below. No recording is part of this repository.",
    ]
    for kind in KINDS:
        table = args.data / f"{kind}.tsv"
        if table.exists():
            lines += section(kind, read_manifest(table))
        if kind == "speech" and table.exists():
            lines.append(SPEECH_CREDITS)
    args.out.write_text("\n".join(lines) + "\n", encoding="utf-8")


if __name__ == "__main__":
    main()
