'use strict';
// The page of the line: everything it shows comes from the stream.

import { Desk } from './desk.js';
import { byId, say } from './dom.js';
import { Keys } from './keys.js';
import { useToken } from './post.js';
import { Stop } from './stop.js';
import { Stream } from './stream.js';
import { Tiles } from './tiles.js';
import { Tone } from './tone.js';
import { word } from './words.js';

const slots = new Map();
const title = document.title;
const news = (text) => say(byId('news'), text);
const stop = new Stop(slots, news);
const tiles = new Tiles({ choose: (slot) => desk.choose(slot), stop: (slot) => stop.ask(slot) });
const desk = new Desk((slot, open) => {
  tiles.mark(slot);
  document.title = open ? `(${open}) ${title}` : title;
});
const tone = new Tone();
new Keys(desk);

let lost = null;

function take(document_, only) {
  if (document_.token) useToken(document_.token);
  if (only) slots.clear();
  document_.slots.forEach((slot) => slots.set(slot.slot, slot));
  tiles.show(document_.slots, only);
  desk.take(document_.slots, only);
  stop.look();
  showCounts(document_.counts);
  const ended = document_.ended.map(({ slot, verdict }) => {
    tone.play(verdict);
    return `${word('slot', { slot })}: ${word(`verdict.${verdict.toLowerCase()}`)}`;
  });
  if (ended.length) news(ended.join(', '));
  found();
  loadAgainIfNewer(document_.version);
}

function showCounts(counts) {
  for (const [verdict, count] of Object.entries(counts)) {
    say(document.querySelector(`[data-count="${verdict}"]`), String(count));
  }
}

function found() {
  lost = null;
  byId('gone').hidden = true;
  document.body.classList.remove('is-gone');
  desk.connected(true);
}

function lose(ended) {
  lost = lost || new Date();
  const time = lost.toLocaleTimeString(document.documentElement.lang);
  say(byId('gone'), word(ended ? 'gone.ended' : 'gone.lost', { time }));
  byId('gone').hidden = false;
  document.body.classList.add('is-gone');
  desk.connected(false);
}

// The station was started again with other pages than this one.
function loadAgainIfNewer(version) {
  if (!version || version === document.body.dataset.version) return;
  if (sessionStorage.getItem('amt-loaded-for') === version) return;
  sessionStorage.setItem('amt-loaded-for', version);
  location.reload();
}

new Stream({
  snapshot: (document_) => take(document_, true),
  change: (document_) => take(document_, false),
  lost: lose,
});
