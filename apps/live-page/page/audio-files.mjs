// Sound files in and out: anything the browser decodes comes in as 16-bit mono, WAV goes out.

/** Largest file that is opened, bytes. */
export const MAX_FILE_BYTES = 100 * 1024 * 1024;

const DECODED_RATE = 48000;

const minutes = (seconds) => `${Math.ceil(seconds / 60)} minutes`;
const megabytes = (bytes) => `${Math.round(bytes / 1024 / 1024)} MB`;

function checkLength(seconds, maxSeconds, name) {
  if (seconds <= maxSeconds) return;
  throw new Error(
    `"${name}" lasts about ${minutes(seconds)}; this page takes up to ${minutes(maxSeconds)}. ` +
      'The command "morva denoise" takes any length.',
  );
}

/** Seconds according to the file's head, without decoding it; 0 when it does not say. */
function announcedSeconds(blob) {
  const address = URL.createObjectURL(blob);
  const audio = new Audio();
  return new Promise((resolve) => {
    audio.preload = 'metadata';
    audio.onloadedmetadata = () => resolve(Number.isFinite(audio.duration) ? audio.duration : 0);
    audio.onerror = () => resolve(0);
    audio.src = address;
  }).finally(() => {
    audio.removeAttribute('src');
    URL.revokeObjectURL(address);
  });
}

/** Sampling rate according to the head of a WAV or FLAC file; 0 when it does not say. */
function announcedRate(head) {
  const view = new DataView(head);
  const isAt = (at, letters) =>
    [...letters].every((c, i) => view.getUint8(at + i) === c.charCodeAt(0));
  if (view.byteLength < 44) return 0;
  if (isAt(0, 'fLaC')) return view.getUint32(18) >>> 12;
  if (!isAt(8, 'WAVE')) return 0;
  for (let at = 12; at + 16 <= view.byteLength; ) {
    if (isAt(at, 'fmt ')) return view.getUint32(at + 12, true);
    const size = view.getUint32(at + 4, true);
    at += 8 + size + (size % 2);
  }
  return 0;
}

function toMono16(buffer) {
  const channels = Array.from({ length: buffer.numberOfChannels }, (_, i) =>
    buffer.getChannelData(i),
  );
  const samples = new Int16Array(buffer.length);
  for (let i = 0; i < samples.length; ++i) {
    let sum = 0;
    for (const channel of channels) sum += channel[i];
    const value = sum / channels.length;
    samples[i] = Math.max(-32768, Math.min(32767, Math.round(value * 32768)));
  }
  return samples;
}

/**
 * 16-bit mono at the file's own rate, if that is among `rates` and a WAV or FLAC file announces it, else at
 * DECODED_RATE. Rejects with a sentence for people.
 * @returns {Promise<{ samples: Int16Array, rate: number, announced: number }>} `announced`: the file's own
 *   rate, 0 when that is not known
 */
export async function readSoundFile(file, name, { maxSeconds, sampleRates }) {
  if (file.size > MAX_FILE_BYTES) {
    throw new Error(
      `"${name}" has ${megabytes(file.size)}; this page takes up to ${megabytes(MAX_FILE_BYTES)}.`,
    );
  }
  checkLength(await announcedSeconds(file), maxSeconds, name);
  const bytes = await file.arrayBuffer();
  const announced = announcedRate(bytes);
  const rate = sampleRates.includes(announced) ? announced : DECODED_RATE;
  let decoded;
  try {
    decoded = await new OfflineAudioContext(1, 1, rate).decodeAudioData(bytes);
  } catch {
    throw new Error(`"${name}" is no sound file that this browser can decode.`);
  }
  checkLength(decoded.duration, maxSeconds, name);
  return { samples: toMono16(decoded), rate, announced };
}

/** A mono 16-bit WAV file. */
export function wavFile(samples, rate) {
  const header = new DataView(new ArrayBuffer(44));
  const text = (at, letters) => {
    for (let i = 0; i < letters.length; ++i) header.setUint8(at + i, letters.charCodeAt(i));
  };
  text(0, 'RIFF');
  header.setUint32(4, 36 + samples.byteLength, true);
  text(8, 'WAVEfmt ');
  header.setUint32(16, 16, true);
  header.setUint16(20, 1, true);
  header.setUint16(22, 1, true);
  header.setUint32(24, rate, true);
  header.setUint32(28, rate * 2, true);
  header.setUint16(32, 2, true);
  header.setUint16(34, 16, true);
  text(36, 'data');
  header.setUint32(40, samples.byteLength, true);
  return new Blob([header, samples], { type: 'audio/wav' });
}
