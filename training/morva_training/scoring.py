"""Scores of a detector: how well numbers separate the true from the false."""

from __future__ import annotations

import numpy as np


def roc_auc(scores: np.ndarray, labels: np.ndarray) -> float:
    """Area under the receiver operating curve; ties count half."""
    positive, negative = scores[labels], np.sort(scores[~labels])
    below = np.searchsorted(negative, positive, "left") + np.searchsorted(negative, positive, "right")
    return float(below.mean() / (2 * max(1, len(negative))))


def best_f1(scores: np.ndarray, labels: np.ndarray) -> tuple[float, float]:
    """The best F1 over all thresholds and the threshold that gives it."""
    order = np.argsort(-scores)
    hits = np.cumsum(labels[order])
    f1 = 2 * hits / (np.arange(1, len(scores) + 1) + labels.sum())
    best = int(np.argmax(f1))
    return float(f1[best]), float(scores[order][best])
