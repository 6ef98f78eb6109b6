// The page: what the buttons do, and in which of these states it is.
//   idle       nothing to hear or save         opening    a microphone or file is being opened
//   recording  it runs through the engine      cleaning   the rest, or a whole take, runs through
//   ready      a take can be heard and saved
// Where the sound is cleaned is the link's business: `startPage` is given one.
import { readSoundFile, wavFile } from './audio-files.mjs';
import { Player } from './player.mjs';
import { Recorder } from './recorder.mjs';
import { Take } from './take.mjs';
import { clock, View } from './view.mjs';

const PREFERRED_RATE = 48000;
const PIECE_SECONDS = 5; // of a file between two looks at what the person does

const element = (id) => document.getElementById(id);
const [recordButton, playButton, modelList] = ['record', 'play', 'model'].map(element);
const [positionSlider, fileInput] = ['position', 'file'].map(element);

/** @type {import('./link.mjs').Link} */
let link = null;
let engine = null; // what the link's other side said in its hello
let sound = null; // { context, recorder, player }, made when first needed
let take = null;
let state = 'idle';
let lastSaid = ''; // once nothing was under way
let isSeeking = false;

const view = new View({
  position: () => (sound && state !== 'recording' ? sound.player.position : null),
  onSeek: (seconds) => state !== 'recording' && sound?.player.seek(seconds),
});

// ---- what the page says -------------------------------------------------------------------------

const say = (text) => {
  element('status').textContent = text;
};

function sayAtRest(text) {
  lastSaid = text;
  say(text);
}

function complain(error) {
  element('problem-text').textContent = error.message;
  element('problem').hidden = false;
  element('retry').hidden = engine !== null;
}

function settle() {
  element('problem').hidden = true;
}

function enter(next) {
  state = next;
  document.body.classList.toggle('recording', state === 'recording');
  document.body.classList.toggle('empty', take === null);
  element('record-label').textContent = state === 'recording' ? 'Stop' : 'Record';
  element('progress').hidden = state !== 'cleaning';
  const isUp = engine !== null;
  recordButton.disabled = !isUp || state === 'cleaning' || state === 'opening';
  const isBusy = state === 'recording' || state === 'opening';
  for (const id of ['choose', 'example']) element(id).disabled = !isUp || isBusy;
  modelList.disabled = !isUp || state === 'opening';
  const canListen = (sound?.player.duration ?? 0) > 0 && !isBusy;
  for (const button of [playButton, positionSlider]) button.disabled = !canListen;
  for (const id of ['save', 'save-original']) element(id).disabled = state !== 'ready';
  if (take !== null) view.show(take, { isLive: state === 'recording' });
}

function showPlayer() {
  const { player } = sound;
  playButton.textContent = player.isPlaying ? 'Pause' : 'Play';
  for (const input of document.getElementsByName('side')) {
    input.checked = input.value === player.heard;
  }
}

function showPosition() {
  requestAnimationFrame(showPosition);
  if (sound === null) return;
  const { position, duration } = sound.player;
  positionSlider.max = Math.max(duration, 0.01);
  if (!isSeeking) positionSlider.value = position;
  const text = `${clock(position, 1)} / ${clock(duration, 1)}`;
  if (element('time').textContent !== text) element('time').textContent = text;
}

/** Where the page stands when nothing is being opened; the rest of a take may still be on its way. */
function restingState() {
  if (take === null || take.isComplete) return take === null ? 'idle' : 'ready';
  return link.isOpen ? 'cleaning' : 'idle';
}

// ---- sound --------------------------------------------------------------------------------------

function needSound() {
  if (sound !== null) return sound;
  let context = new AudioContext();
  if (!engine.sampleRates.includes(context.sampleRate)) {
    context.close();
    context = new AudioContext({ sampleRate: PREFERRED_RATE });
  }
  const player = new Player(context);
  player.addEventListener('change', showPlayer);
  const recorder = new Recorder(context);
  recorder.monitor(element('monitor').checked);
  sound = { context, player, recorder };
  return sound;
}

function beginTake(name, rate) {
  settle();
  needSound().player.clear();
  take = new Take(rate, name);
  element('pauses').textContent = '–';
}

async function record() {
  settle();
  const { recorder, player } = needSound();
  player.pause();
  enter('opening');
  say('Waiting for the microphone …');
  await recorder.start({
    onSamples(samples) {
      if (state !== 'recording') return;
      take.addOriginal(samples);
      link.send(samples);
      if (take.seconds >= engine.maxSeconds - 1) stopRecording();
    },
    onEnded: stopRecording,
  });
  if (engine === null) return recorder.stop(); // lost while the person was asked
  beginTake('recording', sound.context.sampleRate);
  startStream();
  enter('recording');
  say('Recording. Speak, be silent, make noise.');
}

function startStream() {
  link.start({ sampleRate: take.rate, model: modelList.value });
  take.models.push(modelList.value);
}

function stopRecording() {
  if (state !== 'recording') return;
  sound.recorder.stop();
  link.stop();
  enter('cleaning');
}

/** Sends the whole take through the engine; what was there before is replaced as it comes back. */
async function cleanTake() {
  await link.connect();
  take.forgetCleaned();
  startStream();
  enter('cleaning');
  say(`Cleaning ${take.name} …`);
  await link.sendAll(take.before.samples.values);
}

/** A long sound takes seconds to analyse: in pieces, or the page would stand still. */
async function addOriginal(whole, samples) {
  const step = PIECE_SECONDS * whole.rate;
  for (let at = 0; at < samples.length; at += step) {
    whole.addOriginal(samples.subarray(at, at + step));
    await new Promise((resolve) => setTimeout(resolve));
  }
}

async function openFile(file, name) {
  if (state === 'recording' || state === 'opening' || engine === null) return;
  settle();
  enter('opening');
  say(`Reading ${name} …`);
  const { samples, rate, announced } = await readSoundFile(file, name, engine);
  if (samples.length === 0) throw new Error(`"${name}" holds no sound.`);
  beginTake(name, rate);
  take.conversion = conversionOf(rate, announced);
  const begun = take;
  await addOriginal(begun, samples);
  if (take === begun) await cleanTake();
}

function conversionOf(rate, announced) {
  if (rate === announced) return '';
  const origin = announced === 0 ? 'as the browser decodes it' : `converted from ${announced} Hz`;
  return ` (${origin}, at ${rate} Hz)`;
}

async function openExample() {
  const response = await fetch(engine.example);
  if (!response.ok) throw new Error(`The example cannot be read: ${response.status}`);
  await openFile(await response.blob(), 'example.flac');
}

function finishTake() {
  const { player } = sound;
  const after = take.after.samples.values;
  if (player.duration > 0) player.replaceCleaned(after, take.rate);
  else player.load({ before: take.before.samples.values, after, rate: take.rate });
  take.isComplete = true;
  element('pauses').textContent = take.noiseInPauses ?? 'no pauses';
  showModels();
  const what = `${take.name}${take.conversion}: ${take.seconds.toFixed(1)} s`;
  sayAtRest(`${what} cleaned. Play, and swap before and after.`);
  enter('ready');
}

function showModels() {
  element('after-caption').textContent = `cleaned with ${take.models.join(', then ')}`;
}

function save(samples, suffix) {
  const anchor = document.createElement('a');
  anchor.href = URL.createObjectURL(wavFile(samples, take.rate));
  anchor.download = `${take.name.replace(/\.[^.]*$/, '')}-${suffix}.wav`;
  anchor.click();
  setTimeout(() => URL.revokeObjectURL(anchor.href), 60_000);
}

// ---- from the engine ----------------------------------------------------------------------------

function listen() {
  link.addEventListener('hello', ({ detail }) => {
    engine = detail;
    const chosen = modelList.value || engine.models.at(-1).name;
    modelList.replaceChildren(
      ...engine.models.map(({ name, rate }) => {
        return new Option(`${name} · ${rate / 1000} kHz`, name, false, name === chosen);
      }),
    );
    element('example').hidden = !engine.example;
    settle();
    if (take === null) sayAtRest('Ready. Record, drop a file anywhere, or choose one.');
    enter(state);
  });

  link.addEventListener('progress', ({ detail }) => {
    if (engine === null) say(`Loading models … ${Math.floor(100 * detail.share)} %`);
  });

  link.addEventListener('started', ({ detail }) => {
    showModels();
    element('latency').textContent = `${((1000 * detail.latency) / take.rate).toFixed(1)} ms`;
  });

  link.addEventListener('model', ({ detail }) => {
    take.models.push(detail.name);
    showModels();
  });

  link.addEventListener('result', ({ detail }) => {
    take.addResult(detail);
    if (state === 'recording') sound.recorder.hear(detail.samples);
    element('progress').value = take.after.samples.length / Math.max(1, take.before.samples.length);
    view.refresh();
  });

  link.addEventListener('done', finishTake);

  link.addEventListener('lost', ({ detail }) => {
    if (state === 'recording') sound.recorder.stop();
    engine = null;
    say('Not connected.');
    complain(new Error(detail));
    enter(restingState());
  });
}

// ---- from the person ----------------------------------------------------------------------------

const attempt = (action) => async () => {
  try {
    await action();
  } catch (error) {
    say(engine === null ? 'Not connected.' : lastSaid);
    complain(error);
    if (state === 'opening') enter(restingState());
  }
};

const toggleRecording = attempt(() => (state === 'recording' ? stopRecording() : record()));
const togglePlaying = attempt(() =>
  sound.player.isPlaying ? sound.player.pause() : sound.player.play(),
);

recordButton.addEventListener('click', toggleRecording);
playButton.addEventListener('click', togglePlaying);
element('choose').addEventListener('click', () => fileInput.click());
element('example').addEventListener('click', attempt(openExample));
element('retry').addEventListener('click', attempt(reconnect));
element('monitor').addEventListener('change', ({ target }) => {
  sound?.recorder.monitor(target.checked);
});
element('save').addEventListener('click', () => save(take.after.samples.values, 'cleaned'));
element('save-original').addEventListener('click', () => {
  save(take.before.samples.values, 'original');
});

fileInput.addEventListener('change', () => {
  const [file] = fileInput.files;
  fileInput.value = ''; // the same file may be chosen again
  if (file) attempt(() => openFile(file, file.name))();
});

modelList.addEventListener(
  'change',
  attempt(async () => {
    if (state === 'recording') link.chooseModel(modelList.value);
    else if (take !== null && take.seconds > 0) await cleanTake();
  }),
);

positionSlider.addEventListener('input', () => {
  isSeeking = true;
  sound.player.seek(Number(positionSlider.value));
});
positionSlider.addEventListener('change', () => {
  isSeeking = false;
});

for (const input of document.getElementsByName('side')) {
  input.addEventListener('change', () => listenTo(input.value));
}

function listenTo(side) {
  if (engine === null && sound === null) return;
  needSound().player.listenTo(side);
}

document.addEventListener('keydown', (event) => {
  const isTyping = event.target.closest('select, input[type="range"]') !== null;
  if (isTyping || event.repeat || event.ctrlKey || event.altKey || event.metaKey) return;
  const key = event.key.toLowerCase();
  if (key === 'p' && !playButton.disabled) togglePlaying();
  if (key === 'r' && !recordButton.disabled) toggleRecording();
  if (key === 'x' && sound !== null) {
    sound.player.listenTo(sound.player.heard === 'after' ? 'before' : 'after');
  }
});

const hasFiles = (event) => event.dataTransfer?.types.includes('Files');
document.addEventListener('dragover', (event) => {
  if (!hasFiles(event)) return;
  event.preventDefault();
  document.body.classList.add('dropping');
});
document.addEventListener('dragleave', (event) => {
  if (event.relatedTarget === null) document.body.classList.remove('dropping');
});
document.addEventListener('drop', (event) => {
  document.body.classList.remove('dropping');
  if (!hasFiles(event)) return;
  event.preventDefault();
  const [file] = event.dataTransfer.files;
  if (file) attempt(() => openFile(file, file.name))();
});

async function reconnect() {
  say('Connecting …');
  await link.connect();
  if (take !== null && take.seconds > 0 && !take.isComplete) await cleanTake();
}

/** @param {import('./link.mjs').Link} given what cleans the sound */
export function startPage(given) {
  link = given;
  listen();
  showPosition();
  attempt(reconnect)();
}
