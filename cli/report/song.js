// Draws a song's result on a time axis, in player time (ms), and plays the song.
const song = toPlayerTime(JSON.parse(byId("data").textContent));
const beats = song.beats_ms || [];
const soundStart = -song.offset_ms;
const songEnd = Math.max(soundStart + song.read_ms, song.hl_pos_ms || 0, ...beats.slice(-1));
const hasHighlight = song.hl_pos_ms !== undefined;
const loopEnd = Math.min(song.region_end_ms, songEnd);
const timeline = byId("timeline");
const svg = timeline.querySelector("svg");
const view = { from: 0, span: songEnd };

// ---- The picture. x is a time in ms, y a percentage of the height. Zooming only changes the view box.

const draw = (kind, ...points) => drawLine(kind, points, svg);
const drawBox = (kind, from, to) => draw(kind, [from, 0], [to, 0], [to, 100], [from, 100]);

function drawWave() {
  const step = 2 * song.read_ms / song.wave.length;
  const points = song.wave.map((value, k) => [soundStart + (Math.floor(k / 2) + .5) * step, 24 - value * 22 / 127]);
  const lows = points.filter((_, k) => k % 2 === 0), highs = points.filter((_, k) => k % 2 === 1);
  draw("wave", ...highs, ...lows.reverse(), highs[0]);
}

function drawLoudness() {
  const top = Math.max(...song.loudness, 1e-9);
  const y = (value) => 79 - value / top * 29;
  // Each value is drawn in the middle of its 6-second window.
  drawLine("loud", song.loudness.map((value, k) => [soundStart + 2000 * k + 3000, y(value)]), svg);
  const mean = y(song.loudness.reduce((sum, value) => sum + value) / song.loudness.length);
  draw("mean", [0, mean], [songEnd, mean]);
}

if (song.searched_ms) {
  drawBox("unsearched", 0, song.searched_ms[0]);
  drawBox("unsearched", song.searched_ms[1], songEnd);
}
if (hasHighlight) drawBox("region", song.hl_pos_ms, loopEnd);
drawWave();
if (song.loudness.length > 0) drawLoudness();
for (const beat of beats) draw("beat", [beat, 83], [beat, 98]);
if (hasHighlight) draw("start", [song.hl_pos_ms, 0], [song.hl_pos_ms, 100]);
const playhead = draw("head");

function drawTicks() {
  const steps = [100, 200, 500, 1e3, 2e3, 5e3, 1e4, 15e3, 3e4, 6e4, 12e4, 3e5, 6e5, 9e5, 18e5, 36e5, 72e5];
  const most = Math.max(2, timeline.clientWidth / 75);
  const step = steps.find((each) => view.span / each <= most) || view.span;
  byId("times").replaceChildren();
  for (let t = Math.ceil(view.from / step) * step; t <= view.from + view.span; t += step) {
    const label = element("span", step < 1000 ? clock(t) : clock(t).slice(0, -2));
    const edge = 4 * label.textContent.length;  // half a label's width in pixels
    label.style.left = `clamp(${edge}px, ${100 * (t - view.from) / view.span}%, 100% - ${edge}px)`;
    byId("times").append(label);
  }
}

// ---- The picture as a file. It shows the visible part of the song. Sizes are in pixels and
// colours are attributes, so that every program draws the same picture.

function pictureSvg() {
  const width = 1200, height = 360, top = 34, bottom = 330;
  const ink = getComputedStyle(document.body);
  const x = (ms) => Math.min(Math.max(width * (ms - view.from) / view.span, -1e6), 1e6).toFixed(1);  // some programs draw at most 8e6
  const y = (percent) => (top + (bottom - top) * percent / 100).toFixed(1);
  const root = shape("svg", { xmlns: svg.namespaceURI, width, height, viewBox: `0 0 ${width} ${height}`,
    "font-family": "sans-serif", "font-size": 14, fill: ink.color });
  const text = (words, left, base, anchor) => {
    shape("text", { x: left, y: base, "text-anchor": anchor }, root).textContent = words;
  };
  shape("title", {}, root).textContent = song.file;
  shape("rect", { width, height, fill: ink.backgroundColor }, root);
  text(song.file, 8, 22, "start");
  for (const part of svg.children) {
    if (part === playhead) continue;
    const style = getComputedStyle(part);
    const points = part.getAttribute("points").split(" ").map((point) => point.split(","));
    const line = drawLine(part.getAttribute("class"), points.map(([ms, percent]) => [x(ms), y(percent)]), root);
    for (const name of ["fill", "stroke", "stroke-width", "stroke-dasharray", "opacity"]) {
      line.setAttribute(name, style[name]);
    }
  }
  for (const label of byId("times").children) {
    text(label.textContent, width * label.offsetLeft / timeline.clientWidth, 350, "middle");
  }
  return new XMLSerializer().serializeToString(root);
}

function show(from, wantedSpan) {
  view.span = Math.min(Math.max(wantedSpan, 200), songEnd);
  view.from = Math.min(Math.max(from, 0), songEnd - view.span);
  svg.setAttribute("viewBox", `${view.from} 0 ${view.span} 100`);
  drawTicks();
}

function zoom(factor, around = player.now()) {
  const part = Math.min(Math.max((around - view.from) / view.span, 0), 1);
  show(around - part * view.span * factor, view.span * factor);
}

function zoomToBeat() {
  const now = player.now();
  const nearest = beats.reduce((best, beat) => Math.abs(beat - now) < Math.abs(best - now) ? beat : best);
  show(nearest - 1000, 2000);
}

// ---- Sound. A linked file plays in an audio element. A page opened from disk cannot route it
// through an audio context, so the clicks have their own context. An embedded file is decoded and
// plays in the context of the clicks, so that both share one clock. Browsers drop the encoder delay
// that the file states, so the page's times exclude it.

let context = null;  // made by the first Play, because a page may not play sound before a click
const audio = byId("audio");
const linked = {
  play: () => audio.play(),
  pause: () => audio.pause(),
  seek: (ms) => { audio.currentTime = ms / 1000; },
  now: () => audio.currentTime * 1000,
  ended: () => audio.ended,
  playing: () => !audio.paused && !audio.ended,
};

const embedded = {
  buffer: null, node: null, offset: 0, started: 0, decoding: false,
  async play() {
    if (this.decoding) return;
    if (this.buffer === null) {
      this.decoding = true;
      say("Decoding the song …");
      const bytes = Uint8Array.from(atob(song.embedded), (c) => c.charCodeAt(0));
      this.buffer = await context.decodeAudioData(bytes.buffer).finally(() => { this.decoding = false; });
      say("");
    }
    this.node = new AudioBufferSourceNode(context, { buffer: this.buffer });
    this.node.connect(context.destination);
    this.started = context.currentTime;
    this.node.start(this.started, this.offset);
  },
  pause() {
    this.offset = this.now() / 1000;
    this.node?.stop();
    this.node = null;
  },
  seek(ms) {
    const running = this.playing();
    this.pause();
    this.offset = ms / 1000;
    if (running) this.play();
  },
  now() {
    const seconds = this.node ? this.offset + context.currentTime - this.started : this.offset;
    return Math.min(1000 * seconds, this.buffer ? 1000 * this.buffer.duration : songEnd);
  },
  ended() { return this.node !== null && this.now() >= 1000 * this.buffer.duration; },
  playing() { return this.node !== null && !this.ended(); },
};
const player = song.embedded ? embedded : linked;
if (!song.embedded) audio.src = song.audio;

let scheduled = [];  // click nodes that may still sound
let clickedTo = 0;   // all clicks before this time are scheduled

function dropClicks() {
  for (const node of scheduled) node.stop();
  scheduled = [];
  clickedTo = player.now();
}

function addClicks(now) {
  for (const beat of beats) {
    if (beat < clickedTo || beat < now || beat > now + 300) continue;
    const at = context.currentTime + (beat - now) / 1000;
    const gain = new GainNode(context, { gain: .4 });
    const node = new OscillatorNode(context, { frequency: 1800 });
    gain.gain.setValueAtTime(.4, at);
    gain.gain.exponentialRampToValueAtTime(.001, at + .04);
    node.connect(gain).connect(context.destination);
    node.start(at);
    node.stop(at + .05);
    scheduled.push(node);
    clickedTo = beat + 1;
  }
  scheduled = scheduled.slice(-8);
}

const pressed = (id) => byId(id).ariaPressed === "true";
const say = (words) => { byId("status").textContent = words; };

async function togglePlay() {
  if (player.playing()) {
    player.pause();
    dropClicks();
  } else {
    try {
      context ??= window.AudioContext && new AudioContext();
      context?.resume();
      if (player.now() >= songEnd - 50) player.seek(0);
      dropClicks();
      await player.play();
    } catch (error) {
      if (error.name !== "AbortError" && !audio.error) say("This browser cannot play the song.");  // AbortError: paused
    }
  }
  update();
}

function seek(ms) {
  player.seek(Math.min(Math.max(ms, 0), songEnd));
  dropClicks();
  update();
}

// ---- Following the playback.

function update() {
  const now = player.now(), playing = player.playing(), ended = player.ended();
  if (pressed("loop") && (playing && now >= loopEnd || ended && pressed("play"))) {
    seek(song.hl_pos_ms);
    if (ended) player.play();
    return;
  }
  if (playing && pressed("clicks") && context?.state === "running") addClicks(now);
  const isOutside = now < view.from || now > view.from + view.span;
  if (playing && pressed("follow") && isOutside) show(now - view.span / 10, view.span);
  playhead.setAttribute("points", `${now},0 ${now},100`);
  byId("clock").textContent = `${clock(now)} of ${clock(songEnd)}`;
  byId("play").textContent = playing ? "Pause" : "Play";
  byId("play").ariaPressed = playing;
  const second = String(Math.floor(now / 1000));
  if (!playing || timeline.ariaValueNow !== second) {  // a screen reader speaks at most once a second
    timeline.ariaValueNow = second;
    timeline.ariaValueText = clock(now);
  }
}
setInterval(() => { if (player.playing() || pressed("play")) update(); }, 40);

// ---- Controls.

function stepBeat(direction) {
  const now = player.now();
  const to = direction > 0 ? beats.find((beat) => beat > now + 30) : beats.findLast((beat) => beat < now - 30);
  if (to !== undefined) seek(to);
}

function timeAt(event) {
  const box = svg.getBoundingClientRect();
  return view.from + (event.clientX - box.left) / box.width * view.span;
}

function toggle(id) {
  byId(id).ariaPressed = !pressed(id);
  if (id === "clicks") dropClicks();
  if (id === "loop" && pressed(id) && (player.now() < song.hl_pos_ms || player.now() >= loopEnd)) seek(song.hl_pos_ms);
}

const actions = {
  play: togglePlay,
  gohl: () => seek(song.hl_pos_ms),
  loop: () => toggle("loop"),
  clicks: () => toggle("clicks"),
  prev: () => stepBeat(-1),
  next: () => stepBeat(1),
  in: () => zoom(.5),
  out: () => zoom(2),
  whole: () => show(0, songEnd),
  tobeat: zoomToBeat,
  follow: () => toggle("follow"),
  picture: () => download(song.file + ".svg", "image/svg+xml", pictureSvg()),
};
const keys = { " ": "play", k: "play", h: "gohl", l: "loop", c: "clicks", ",": "prev", ".": "next", "+": "in", "-": "out", 0: "whole", z: "tobeat", f: "follow" };
for (const id in actions) byId(id).addEventListener("click", actions[id]);

document.addEventListener("keydown", (event) => {
  if (event.ctrlKey || event.metaKey || event.altKey) return;
  if (event.target.closest("button") && (event.key === " " || event.key === "Enter")) return;
  const moves = { ArrowLeft: -5000, ArrowRight: 5000, PageDown: -30000, PageUp: 30000, Home: -Infinity, End: Infinity };
  const button = byId(keys[event.key.toLowerCase()]);
  if (event.key in moves && (event.target === timeline || event.key.startsWith("Arrow"))) seek(player.now() + moves[event.key]);
  else if (button) button.click();
  else return;
  event.preventDefault();
});
for (const type of ["pointerdown", "pointermove"]) {
  timeline.addEventListener(type, (event) => { if (event.buttons === 1) seek(timeAt(event)); });
}
timeline.addEventListener("wheel", (event) => {
  if (!event.ctrlKey && event.deltaX === 0) return;
  event.preventDefault();
  if (event.ctrlKey) zoom(event.deltaY > 0 ? 1.25 : .8, timeAt(event));
  else show(view.from + event.deltaX * view.span / 1000, view.span);
});
addEventListener("resize", drawTicks);
audio.addEventListener("error", () => say(`The song was not found at ${new URLSearchParams("=" + song.audio).get("")}, or this browser cannot play it. A page made with --embed contains its song.`));

async function copy(words) {
  const isCopied = await navigator.clipboard?.writeText(words).then(() => true, () => false);
  say(isCopied ? `${words} copied.` : words);
}

function timeButton(ms) {
  const button = element("button", clock(ms));
  button.addEventListener("click", () => { seek(ms); copy(clock(ms)); });
  return element("li", button);
}

function addFact(words, value) {
  const item = element("li", words + " ", element("b", value));
  byId("facts").append(item);
  return item;
}

document.title = byId("name").textContent = song.file;
timeline.ariaValueMax = Math.floor(songEnd / 1000);
addFact("length", clock(song.duration_ms));
addFact("", `${song.sample_rate} Hz, ${song.channels} ${song.channels === 1 ? "channel" : "channels"}`);
if (hasHighlight) {
  const start = (song.hl_refined === false ? "about " : "") + clock(song.hl_pos_ms);
  const value = start + (song.hl_end_ms === undefined ? "" : ` to ${clock(song.hl_end_ms)}`);
  Object.assign(addFact("highlight", value), { title: "Copy", onclick: () => copy(value) });
}
if (song.bpm !== undefined) {
  addFact(song.mode === "both" ? "tempo from the highlight on" : "tempo", `${song.bpm} BPM`);
  addFact("beats", song.beat_count);
}
for (const id of ["gohl", "loop"]) byId(id).disabled = !hasHighlight;
for (const id of ["clicks", "prev", "next", "tobeat"]) byId(id).disabled = beats.length === 0;
byId("loudname").hidden = song.loudness.length === 0;
byId("beatname").hidden = byId("beatlist").hidden = beats.length === 0;
byId("unsearched").hidden = !song.searched_ms;
for (const beat of beats) byId("beattimes").append(timeButton(beat));
if (song.note) say(song.note);
show(0, songEnd);
update();
