// Drives a camera with the client of the package "onvif" and prints what it learnt as JSON, a line for each step.
//   node onvif-peer.js STREAMS [USER PASSWORD]
// Finds the cameras, takes the one whose stream address ends with STREAMS, moves it, stops it and uses its presets.
'use strict';
const { Discovery } = require('onvif');
const [streams, username, password] = process.argv.slice(2);

function ask(camera, method, ...options) {
  return new Promise((resolve, reject) =>
    camera[method](...options, (error, value) => (error ? reject(error) : resolve(value))));
}

function tell(step, value) {
  console.log(JSON.stringify({ [step]: value }));
}

async function until(condition) {
  const deadline = Date.now() + 10000;
  while (!(await condition())) {
    if (Date.now() > deadline) throw new Error('waited in vain');
    await new Promise(resolve => setTimeout(resolve, 50));
  }
}

function discover() {
  return new Promise((resolve, reject) =>
    Discovery.probe({ timeout: 1000 }, (error, found) => (error ? reject(error) : resolve(found))));
}

async function choose(found) {
  for (const camera of found) {
    Object.assign(camera, { username, password });
    await ask(camera, 'connect');
    await ask(camera, 'getDeviceInformation');
    const { uri } = await ask(camera, 'getStreamUri', { protocol: 'RTSP' });
    if (uri.endsWith(streams)) {
      tell('stream', uri);
      return camera;
    }
  }
  throw new Error('no camera with ' + streams);
}

async function steer(camera) {
  const status = () => ask(camera, 'getStatus');
  await ask(camera, 'continuousMove', { x: 0.5, y: -0.25, zoom: 0.2, timeout: 20000 });
  await until(async () => (await status()).position.x > 0.05);
  tell('moving', await status());
  await ask(camera, 'stop', { panTilt: true, zoom: true });
  const stopped = await status();
  await new Promise(resolve => setTimeout(resolve, 100));
  tell('stands', JSON.stringify(stopped.position) === JSON.stringify((await status()).position));

  await ask(camera, 'continuousMove', { x: 0.2, timeout: 300 });
  await until(async () => (await status()).moveStatus.panTilt === 'IDLE');
  tell('timeout', (await status()).position.x > stopped.position.x);

  await ask(camera, 'setPreset', { presetName: 'Door' });
  const kept = (await status()).position;
  await ask(camera, 'absoluteMove', { x: -0.2, y: 0.1, zoom: 0.3 });
  await until(async () => (await status()).moveStatus.panTilt === 'IDLE');
  tell('absolute', (await status()).position);
  await ask(camera, 'relativeMove', { x: 0.1, y: 0, zoom: 0 });
  await until(async () => (await status()).moveStatus.panTilt === 'IDLE');
  tell('relative', (await status()).position);
  const presets = await ask(camera, 'getPresets');
  tell('presets', Object.keys(presets));
  await ask(camera, 'gotoPreset', { preset: presets.Door.$.token });
  await until(async () => {
    const at = await status();
    return at.moveStatus.panTilt === 'IDLE' && at.moveStatus.zoom === 'IDLE';
  });
  tell('recalled', JSON.stringify((await status()).position) === JSON.stringify(kept));
  await ask(camera, 'removePreset', { presetToken: presets.Door.$.token });
  tell('left', Object.keys(await ask(camera, 'getPresets')));
  tell('refused', await ask(camera, 'gotoPreset', { preset: 99 }).catch(error => error.message));
}

async function focus(camera) {
  await ask(camera, 'imagingMove', { absolute: { position: 0.75 } });
  await until(async () => (await ask(camera, 'imagingGetStatus', {})).focusStatus20.position === 0.75);
  tell('focus', (await ask(camera, 'getImagingSettings')).focus.autoFocusMode);
}

async function main() {
  const found = await discover();
  tell('found', found.length);
  const camera = await choose(found);
  tell('profiles', camera.profiles.map(profile => profile.name));
  tell('nodes', Object.keys(await ask(camera, 'getNodes')));
  await steer(camera);
  await focus(camera);
}

main().then(() => process.exit(0), error => { console.error(error); process.exit(1); });
