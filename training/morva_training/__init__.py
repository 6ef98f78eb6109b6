"""Training of the noise-suppression, voice-activity and noise-level networks.

From folders of speech and noise to the weight files that the engine loads.
"""
