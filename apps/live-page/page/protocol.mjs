// What the page and whatever cleans its sound say to each other, over a WebSocket or otherwise; both
// import this file.
//
// Text messages are JSON objects with a `type`:
//   page -> engine   start { stream, sampleRate, model }   a new sound; replaces the one that runs
//                    model { name }                        another model from the next frame on
//                    stop                                  no more sound; the tail comes back
//   engine -> page   progress { share }                    of what must be loaded before the hello
//                    hello { models, sampleRates, maxSeconds, example }
//                    models: { name, rate } each; example: address of a recording, or null
//                    started { stream, latency }           delay in samples that is taken out
//                    model { stream, name }                the new model is in use
//                    done { stream, samples }              everything has come back
//                    error { code, message }               the connection closes after it
// Binary messages: to the engine 16-bit mono samples; to the page a result as laid out below. Cleaned
// samples are in step with what went in: the n-th sample back belongs to the n-th sample sent.

/** Frame that the meters refer to, milliseconds. */
export const FRAME_MS = 10;

/** Most bytes that the other side takes in one message. */
export const MAX_MESSAGE_BYTES = 256 * 1024;

const HEADER_BYTES = 12;

/**
 * Little-endian: stream, number of voice scores v, number of noise levels n (u32 each); v scores (f32,
 * 0..1); n levels (f32, dB re full scale); samples (i16) up to the end. The k-th score and level belong
 * to the k-th frame of the sound; how many have come differs, since a level needs the cleaned sound.
 * @param {{ stream: number, voice: ArrayLike<number>, noise: ArrayLike<number>, samples: Int16Array }} result
 * @returns {ArrayBuffer}
 */
export function encodeResult({ stream, voice, noise, samples }) {
  const noiseAt = HEADER_BYTES + 4 * voice.length;
  const samplesAt = noiseAt + 4 * noise.length;
  const buffer = new ArrayBuffer(samplesAt + samples.byteLength);
  new Uint32Array(buffer, 0, 3).set([stream, voice.length, noise.length]);
  new Float32Array(buffer, HEADER_BYTES, voice.length).set(voice);
  new Float32Array(buffer, noiseAt, noise.length).set(noise);
  new Int16Array(buffer, samplesAt).set(samples);
  return buffer;
}

/** @param {ArrayBuffer} buffer what `encodeResult` made */
export function decodeResult(buffer) {
  const [stream, voiceLength, noiseLength] = new Uint32Array(buffer, 0, 3);
  const noiseAt = HEADER_BYTES + 4 * voiceLength;
  return {
    stream,
    voice: new Float32Array(buffer, HEADER_BYTES, voiceLength),
    noise: new Float32Array(buffer, noiseAt, noiseLength),
    samples: new Int16Array(buffer, noiseAt + 4 * noiseLength),
  };
}
