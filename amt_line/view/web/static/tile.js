'use strict';
// A slot's tile: its verdict, or what is being done for its handset.

import { make, say, shape } from './dom.js';
import { drawBar } from './bar.js';
import { word } from './words.js';

const VERDICTS = { p: 'pass', f: 'fail', e: 'error', s: 'skipped' };

// What the tile looks like: the last verdict stays until there is a next handset.
export function lookOf(slot) {
  if (slot.question) return 'asking';
  if (['waiting', 'verdict', 'ended'].includes(slot.state) && slot.last) {
    return slot.last.verdict.toLowerCase();
  }
  return slot.state === 'verdict' ? 'waiting' : slot.state;
}

export function timeText(seconds) {
  const whole = Math.max(0, Math.floor(seconds));
  return `${Math.floor(whole / 60)}:${String(whole % 60).padStart(2, '0')}`;
}

export class Tile {
  constructor(name, ask) {
    this.element = make('li', 'tile');
    this.element.dataset.slot = name;
    this.body = make('div', 'body');
    const top = make('div', 'top');
    this.slotName = make('span', 'slot', name);
    const dut = make('span', 'dut');
    this.dut = make('bdi');
    dut.append(this.dut);
    this.time = make('span', 'time');
    top.append(this.slotName, dut, this.time);
    this.main = make('div', 'main');
    this.shape = make('span', 'shape-place');
    this.word = make('span', 'word');
    this.main.append(this.shape, this.word);
    this.what = make('p', 'what');
    this.bar = make('div', 'bar-place');
    this.segments = make('div', 'segments');
    this.segments.setAttribute('role', 'progressbar');
    this.segments.setAttribute('aria-valuemin', '0');
    const foot = make('div', 'foot');
    this.state = make('span', 'state');
    this.choose = make('button', 'choose', word('desk.choose'));
    this.choose.type = 'button';
    this.choose.setAttribute('aria-label', `${word('desk.choose')}: ${word('slot', { slot: name })}`);
    this.element.addEventListener('click', (event) => {
      if (event.target !== this.stop && !this.choose.hidden) ask.choose(name);
    });
    this.stop = make('button', 'stop', word('stop'));
    this.stop.type = 'button';
    this.stop.setAttribute('aria-label', `${word('stop')}: ${word('slot', { slot: name })}`);
    this.stop.addEventListener('click', () => ask.stop(name));
    foot.append(this.state, this.choose, this.stop);
    this.body.append(top, this.main, this.what, this.bar, this.segments, foot);
    this.element.append(this.body);
    this.began = null;
  }

  show(slot) {
    const look = lookOf(slot);
    const running = Boolean(slot.run);
    const verdict = !running && slot.last && look === slot.last.verdict.toLowerCase();
    this.began = slot.elapsed === null ? null : performance.now() - slot.elapsed * 1000;
    if (this.element.dataset.look !== look) {
      this.element.dataset.look = look;
      this.shape.replaceChildren(shape(look));
    }
    this.element.classList.toggle('is-running', running);
    say(this.dut, running ? slot.dut : (verdict && slot.last.dut) || '');
    this.sayWord(this.wordFor(slot, look, running, verdict));
    say(this.what, whatFor(slot, running, verdict));
    this.showBar(verdict ? slot.last : null);
    this.showSteps(slot, running);
    say(this.state, stateFor(slot, running, verdict));
    this.stop.hidden = !(running || slot.state === 'asking');
    this.choose.hidden = !slot.question;
    this.fixed = verdict ? slot.last.seconds : null;
    this.tick();
  }

  // As large as its letters let it be; a Chinese one is as wide as two.
  sayWord(text) {
    if (this.word.textContent === text) return;
    say(this.word, text);
    const letters = [...text].reduce((sum, letter) => sum + (letter > '\u2e80' ? 1.5 : 1), 0);
    this.main.style.setProperty('--letters', Math.max(4, letters));
  }

  wordFor(slot, look, running, verdict) {
    if (verdict) return word(`verdict.${look}`);
    if (look === 'running' && slot.steps) return `${currentStep(slot)}/${slot.steps}`;
    return word(`look.${look}`);
  }

  showBar(last) {
    const bar = last && last.value ? drawBar(last.value) : null;
    this.bar.replaceChildren(...(bar ? [bar] : []));
  }

  showSteps(slot, running) {
    this.segments.hidden = !running;
    if (!running) return;
    this.segments.setAttribute('aria-valuemax', String(slot.steps));
    this.segments.setAttribute('aria-valuenow', String(slot.verdicts.length));
    this.segments.setAttribute('aria-label', word('line.progress'));
    while (this.segments.childElementCount > slot.steps) this.segments.lastElementChild.remove();
    while (this.segments.childElementCount < slot.steps) this.segments.append(make('span'));
    [...this.segments.children].forEach((segment, index) => {
      const letter = slot.verdicts[index];
      segment.className = letter ? VERDICTS[letter]
        : (index === slot.verdicts.length ? 'now' : '');
    });
  }

  tick() {
    const seconds = this.began === null ? this.fixed
      : (performance.now() - this.began) / 1000;
    say(this.time, seconds === null ? '' : timeText(seconds));
  }
}

function currentStep(slot) {
  return slot.step ? slot.step.number : slot.verdicts.length;
}

function whatFor(slot, running, verdict) {
  if (slot.notice) return slot.notice;
  if (slot.question) return slot.question.text;
  if (running) return slot.step ? slot.step.name : slot.plan;
  if (verdict) return slot.last.reason;
  return slot.text;
}

function stateFor(slot, running, verdict) {
  if (slot.notice) return word('line.act');
  if (running) {
    const again = slot.step && slot.step.attempt > 1
      ? word('line.attempt', { attempt: slot.step.attempt }) : '';
    return again || (slot.question ? `${currentStep(slot)}/${slot.steps}` : slot.plan);
  }
  if (verdict) return slot.state === 'ended' ? word('look.ended') : slot.last.advice || word('line.next');
  return slot.port;
}
