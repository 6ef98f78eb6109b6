"""Makes the packages of this source tree importable: morva (python/) and morva_training (training/)."""

import sys
from pathlib import Path

ROOT = Path(__file__).resolve().parents[2]
sys.path[:0] = [str(ROOT / "training"), str(ROOT / "python")]
