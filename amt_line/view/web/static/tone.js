'use strict';
// A tone for each verdict, for whoever does not look; off until it is wanted, and remembered.

import { byId } from './dom.js';

const REMEMBERED = 'amt-tone';
// Frequencies in Hz, one after the other, and how each sounds.
const TONES = {
  PASS: { notes: [660, 880], wave: 'sine', length: 0.14 },
  FAIL: { notes: [220, 165], wave: 'sawtooth', length: 0.28 },
  ERROR: { notes: [330, 330, 330], wave: 'square', length: 0.12 },
  ABORTED: { notes: [440, 330, 220], wave: 'triangle', length: 0.16 },
};
const LOUDNESS = 0.2;

export class Tone {
  constructor() {
    this.button = byId('tone');
    this.on = remembered();
    this.button.setAttribute('aria-pressed', String(this.on));
    this.button.addEventListener('click', () => this.turn());
    // A browser is silent until somebody has touched the page.
    for (const kind of ['pointerdown', 'keydown']) {
      addEventListener(kind, () => this.on && this.wake());
    }
  }

  turn() {
    this.on = !this.on;
    this.button.setAttribute('aria-pressed', String(this.on));
    try {
      localStorage.setItem(REMEMBERED, this.on ? 'on' : 'off');
    } catch (error) {
      // A browser that keeps nothing asks again next time.
    }
    if (this.on) {
      this.wake();
      this.play('PASS');
    }
  }

  wake() {
    this.context = this.context || new AudioContext();
    if (this.context.state === 'suspended') this.context.resume();
  }

  play(verdict) {
    const tone = TONES[verdict];
    if (!this.on || !tone || !this.context || this.context.state !== 'running') return;
    tone.notes.forEach((frequency, index) => {
      const begin = this.context.currentTime + index * tone.length;
      const sound = new OscillatorNode(this.context, { type: tone.wave, frequency });
      const loudness = new GainNode(this.context, { gain: LOUDNESS });
      loudness.gain.setTargetAtTime(0, begin + tone.length * 0.7, 0.02);
      sound.connect(loudness).connect(this.context.destination);
      sound.start(begin);
      sound.stop(begin + tone.length);
    });
  }
}

function remembered() {
  try {
    return localStorage.getItem(REMEMBERED) === 'on';
  } catch (error) {
    return false;
  }
}
