"""Composite ratings of one aligned pair: signal, background, overall, as listeners would give them (1 to 5).

Hu and Loizou, "Evaluation of objective quality measures for speech enhancement", IEEE Trans. ASLP 16 (2008):
log-likelihood ratio, weighted spectral slope and segmental signal-to-noise ratio beside PESQ, at 16 kHz.
"""

from __future__ import annotations

from typing import NamedTuple

import numpy as np
from metrics import at_rate

RATE = 16000
FRAME = 480  # 30 ms
HOP = 120
LPC_ORDER = 16
QUIET = 1e-10
BEST = 0.95  # share of the frames that count, the worst left out


def _frames(samples: np.ndarray) -> np.ndarray:
    count = (len(samples) - FRAME) // HOP + 1
    window = np.hanning(FRAME + 2)[1:-1]
    return np.lib.stride_tricks.sliding_window_view(samples, FRAME)[: count * HOP : HOP] * window


def _mean_of_best(values: np.ndarray) -> float:
    return float(np.mean(np.sort(values)[: max(1, round(BEST * len(values)))]))


def _autocorrelation(frames: np.ndarray) -> np.ndarray:
    power = np.abs(np.fft.rfft(frames, 2 * FRAME)) ** 2
    return np.fft.irfft(power)[:, : LPC_ORDER + 1]


def _predictors(correlation: np.ndarray) -> np.ndarray:
    """Levinson and Durbin's recursion for all frames at once: prediction error filters, 1 first."""
    filters = np.zeros_like(correlation)
    filters[:, 0] = 1.0
    error = correlation[:, 0].copy()
    for order in range(1, LPC_ORDER + 1):
        reflected = np.einsum("fi,fi->f", filters[:, :order], correlation[:, order:0:-1])
        gain = -reflected / np.maximum(error, QUIET)
        filters[:, : order + 1] += gain[:, None] * filters[:, order::-1]
        error *= 1 - gain**2
    return filters


def log_likelihood_ratio(reference: np.ndarray, result: np.ndarray) -> float:
    """How badly the result's spectral envelope explains the reference; mean of the best 95 % of frames, 0..2."""
    frames = [_frames(signal) + QUIET for signal in (reference, result)]
    correlations = [_autocorrelation(f) for f in frames]
    correlations = [c * (1 + 1e-9 * (np.arange(c.shape[1]) == 0)) for c in correlations]
    lag = np.abs(np.subtract.outer(np.arange(LPC_ORDER + 1), np.arange(LPC_ORDER + 1)))
    toeplitz = correlations[0][:, lag]
    own, other = (_predictors(c) for c in correlations)
    numerator = np.einsum("fi,fij,fj->f", other, toeplitz, other)
    denominator = np.einsum("fi,fij,fj->f", own, toeplitz, own)
    ratios = np.log(np.maximum(numerator, QUIET) / np.maximum(denominator, QUIET))
    return _mean_of_best(np.clip(ratios, 0.0, 2.0))


# Centres and widths in Hz of the 25 critical bands of the spectral slope measure (Klatt 1982).
BAND_CENTRES = np.array([50.0, 120, 190, 260, 330, 400, 470, 540, 617.372, 703.378, 798.717, 904.128, 1020.38, 1148.30,
                         1288.72, 1442.54, 1610.70, 1794.16, 1993.93, 2211.08, 2446.71, 2701.97, 2978.04, 3276.17,
                         3597.63])  # fmt: skip
BAND_WIDTHS = np.array([70.0] * 7 + [77.3724, 86.0056, 95.3398, 105.411, 116.256, 127.914, 140.423, 153.823, 168.154,
                        183.457, 199.776, 217.153, 235.631, 255.255, 276.072, 298.126, 321.465, 346.136])  # fmt: skip


def _band_levels(samples: np.ndarray) -> np.ndarray:
    size = 1024
    hertz = np.arange(size // 2 + 1) * RATE / size
    bands = np.exp(-11 * ((hertz - BAND_CENTRES[:, None]) / BAND_WIDTHS[:, None]) ** 2)
    bands *= bands > np.exp(-30 / (2 * 2.303))
    bands *= BAND_WIDTHS.min() / BAND_WIDTHS[:, None]
    power = np.abs(np.fft.rfft(_frames(samples), size)) ** 2
    return 10 * np.log10(np.maximum(power @ bands.T, QUIET))


def _slope_weights(levels: np.ndarray, slopes: np.ndarray) -> np.ndarray:
    """Bands near the loudest one and near the peak that their slope leads to count more."""
    nearest = np.empty_like(slopes)
    for band in range(slopes.shape[1]):
        rising = slopes[:, band] > 0
        at = np.where(rising, band, band + 1)
        for _ in range(slopes.shape[1]):
            up = rising & (at < slopes.shape[1]) & (slopes[np.arange(len(at)), np.minimum(at, slopes.shape[1] - 1)] > 0)
            down = ~rising & (at > 0) & (slopes[np.arange(len(at)), np.maximum(at - 1, 0)] <= 0)
            at = at + up - down
        nearest[:, band] = levels[np.arange(len(at)), at]
    own = levels[:, :-1]
    return 20 / (20 + levels.max(axis=1, keepdims=True) - own) / (1 + nearest - own)


def weighted_spectral_slope(reference: np.ndarray, result: np.ndarray) -> float:
    """Difference of the slopes between critical bands; mean of the best 95 % of frames."""
    levels = [_band_levels(signal) for signal in (reference, result)]
    slopes = [np.diff(level, axis=1) for level in levels]
    weights = sum(_slope_weights(level, slope) for level, slope in zip(levels, slopes)) / 2
    distance = np.sum(weights * (slopes[0] - slopes[1]) ** 2, axis=1) / np.sum(weights, axis=1)
    return _mean_of_best(distance)


def segmental_snr(reference: np.ndarray, result: np.ndarray) -> float:
    """Mean over frames of the signal-to-noise ratio, each limited to -10..35 dB."""
    clean, error = _frames(reference), _frames(reference - result)
    ratio = 10 * np.log10((np.sum(clean**2, axis=1) + QUIET) / (np.sum(error**2, axis=1) + QUIET) + QUIET)
    return float(np.mean(np.clip(ratio, -10, 35)))


class Composite(NamedTuple):
    csig: float
    cbak: float
    covl: float
    llr: float


def composite(reference: np.ndarray, result: np.ndarray, rate: int, pesq: float) -> Composite:
    reference, result = (at_rate(s, rate, RATE).astype(np.float64) for s in (reference, result))
    llr = log_likelihood_ratio(reference, result)
    slope = weighted_spectral_slope(reference, result)
    snr = segmental_snr(reference, result)
    ratings = (
        3.093 - 1.029 * llr + 0.603 * pesq - 0.009 * slope,
        1.634 + 0.478 * pesq - 0.007 * slope + 0.063 * snr,
        1.594 + 0.805 * pesq - 0.512 * llr - 0.007 * slope,
    )
    return Composite(*(float(np.clip(r, 1, 5)) if np.isfinite(r) else r for r in ratings), llr)
