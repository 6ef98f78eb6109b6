// Sound files in and out: anything the browser decodes comes in as 16-bit mono, WAV goes out.

/** Largest file that is opened, bytes. */
export const MAX_FILE_BYTES = 100 * 1024 * 1024;

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

function toMono16(buffer) {
  const channels = Array.from({ length: buffer.numberOfChannels }, (_, i) =>
    buffer.getChannelData(i),
  );
  const samples = new Int16Array(buffer.length);
  for (let i = 0; i < samples.length; ++i) {
    let sum = 0;
    for (const channel of channels) sum += channel[i];
    const value = sum / channels.length;
    samples[i] = Math.round(Math.max(-1, Math.min(1, value)) * 32767);
  }
  return samples;
}

/** Samples at the context's rate. Rejects with a sentence for people. */
export async function readSoundFile(file, name, context, maxSeconds) {
  if (file.size > MAX_FILE_BYTES) {
    throw new Error(
      `"${name}" has ${megabytes(file.size)}; this page takes up to ${megabytes(MAX_FILE_BYTES)}.`,
    );
  }
  checkLength(await announcedSeconds(file), maxSeconds, name);
  let decoded;
  try {
    decoded = await context.decodeAudioData(await file.arrayBuffer());
  } catch {
    throw new Error(`"${name}" is no sound file that this browser can decode.`);
  }
  checkLength(decoded.duration, maxSeconds, name);
  return { samples: toMono16(decoded), channels: decoded.numberOfChannels };
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
