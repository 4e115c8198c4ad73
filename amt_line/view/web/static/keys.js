'use strict';
// The keyboard, and the scanner that types like one.

import { byId } from './dom.js';
import { meaning } from './desk.js';

// A key that stands alone for so long was pressed by a person: a scanner types a code at once.
const ALONE = 250;

export class Keys {
  constructor(desk) {
    this.desk = desk;
    this.field = byId('field');
    this.last = -Infinity;
    addEventListener('keydown', (event) => this.press(event), true);
    addEventListener('pointerdown', (event) => this.point(event));
    if (matchMedia('(pointer: coarse)').matches) this.field.inputMode = 'none';
    this.field.addEventListener('pointerdown', () => { this.field.inputMode = 'text'; });
    this.field.focus();
  }

  press(event) {
    if (event.ctrlKey || event.altKey || event.metaKey) return;
    clearTimeout(this.timer);
    const before = performance.now() - this.last;
    this.last = performance.now();
    if (document.querySelector('dialog[open]')) return;
    if (event.key === 'Escape') {
      this.last = -Infinity;
      this.desk.unchoose();
      this.field.focus();
    } else if (event.key.length === 1) {
      this.type(event, before);
    }
  }

  type(event, before) {
    const focused = document.activeElement;
    const isButton = focused && focused.closest('button, a, summary');
    // Space presses the button that has the focus; every other character is for the field.
    if (event.key === ' ' && isButton) return;
    if (focused !== this.field) this.field.focus();
    const answer = meaning(event.key);
    if (this.field.value === '' && answer && this.desk.current
        && this.desk.current.kind === 'yes-no' && before > ALONE && !event.repeat) {
      const question = this.desk.current;
      this.timer = setTimeout(() => this.alone(question, event.key, answer), ALONE);
    }
  }

  alone(question, key, answer) {
    if (this.desk.current !== question || this.field.value !== key) return;
    this.field.value = '';
    this.desk.bind();
    this.desk.answer(answer);
  }

  // A touch beside everything leaves the scanner its field.
  point(event) {
    if (!event.target.closest('button, a, input, summary, dialog, label')) {
      setTimeout(() => this.field.focus(), 0);
    }
  }
}
