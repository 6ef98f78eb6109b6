// A call between two peer connections on one page, the near side's microphone cleaned on its way.
import { Denoiser } from './quorral_valto_web/index.mjs';

const element = (id) => document.getElementById(id);

/** Two ends that find each other without a server; resolves to the stream that the far side receives. */
async function connect(stream) {
  const [near, far] = [new RTCPeerConnection(), new RTCPeerConnection()];
  near.onicecandidate = ({ candidate }) => far.addIceCandidate(candidate);
  far.onicecandidate = ({ candidate }) => near.addIceCandidate(candidate);
  const received = new Promise((resolve) => {
    far.ontrack = ({ track }) => resolve(new MediaStream([track]));
  });
  for (const track of stream.getTracks()) near.addTrack(track, stream);
  await near.setLocalDescription();
  await far.setRemoteDescription(near.localDescription);
  await far.setLocalDescription();
  await near.setRemoteDescription(far.localDescription);
  return received;
}

async function call() {
  element('start').disabled = true;
  // The browser's own suppression would clean first.
  const microphone = await navigator.mediaDevices.getUserMedia({
    audio: { noiseSuppression: false, autoGainControl: false, echoCancellation: false },
  });
  const context = new AudioContext({ sampleRate: 48000 });
  const denoiser = await Denoiser.create(context);
  const sent = new MediaStreamAudioDestinationNode(context, { channelCount: 1 });
  context.createMediaStreamSource(microphone).connect(denoiser).connect(sent);
  denoiser.addEventListener('meters', ({ detail }) => {
    element('voice').value = detail.voice.toFixed(2);
  });
  element('bypass').onchange = ({ target }) => {
    denoiser.bypass.value = target.checked ? 1 : 0;
  };
  element('far').srcObject = await connect(sent.stream);
  const milliseconds = (1000 * denoiser.latency).toFixed(0);
  element('status').textContent = `Connected; cleaning takes ${milliseconds} ms.`;
}

element('start').onclick = () =>
  call().catch(({ message }) => {
    element('status').textContent = message;
    element('start').disabled = false;
  });
