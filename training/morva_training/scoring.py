"""Scores of a detector: how well numbers separate the true from the false."""

from __future__ import annotations

import numpy as np


def roc_auc(scores: np.ndarray, labels: np.ndarray) -> float:
    """Area under the receiver operating curve; ties count half."""
    positive, negative = scores[labels], np.sort(scores[~labels])
    below = np.searchsorted(negative, positive, "left") + np.searchsorted(negative, positive, "right")
    return float(below.mean() / (2 * max(1, len(negative))))


def f1_of_thresholds(scores: np.ndarray, labels: np.ndarray) -> tuple[np.ndarray, np.ndarray]:
    """The thresholds from high to low, and the F1 of what lies at or above each."""
    order = np.argsort(-scores)
    hits = np.cumsum(labels[order])
    return scores[order], 2 * hits / (np.arange(1, len(scores) + 1) + labels.sum())


def best_f1(scores: np.ndarray, labels: np.ndarray) -> tuple[float, float]:
    """The best F1 over all thresholds and the threshold that gives it."""
    thresholds, f1 = f1_of_thresholds(scores, labels)
    best = int(np.argmax(f1))
    return float(f1[best]), float(thresholds[best])


def quick_threshold(scores: np.ndarray, labels: np.ndarray, slack: float) -> float:
    """The lowest threshold with an F1 that is worse than the best by no more than `slack`.

    Around its best the F1 hardly changes, but a lower threshold notices a word's start earlier.
    """
    thresholds, f1 = f1_of_thresholds(scores, labels)
    return float(thresholds[np.flatnonzero(f1 >= f1.max() - slack)[-1]])
