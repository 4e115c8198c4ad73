'use strict';
// The desk: the question that is answered now. One at a time, with its slot's name in large.

import { byId, make, say } from './dom.js';
import { post } from './post.js';
import { word } from './words.js';

// What was pressed for the question before is no answer to this one.
const SETTLE = 400;

export class Desk {
  constructor(onShown) {
    this.onShown = onShown;
    this.questions = new Map(); // slot -> question
    this.duts = new Map();
    this.chosen = null;
    this.current = null;
    this.sending = false;
    this.there = false;
    this.field = byId('field');
    byId('yes').addEventListener('click', () => this.answer('yes'));
    byId('no').addEventListener('click', () => this.answer('no'));
    byId('form').addEventListener('submit', (event) => {
      event.preventDefault();
      this.enter();
    });
    this.field.addEventListener('input', () => this.bind());
    byId('picture-button').addEventListener('click', () => {
      byId('picture-large').src = byId('picture').src;
      byId('picture-dialog').showModal();
    });
    byId('picture-dialog').addEventListener('close', () => this.field.focus());
    this.change('', null);
  }

  take(slots, only) {
    if (only) this.questions.clear();
    for (const slot of slots) {
      if (slot.question) this.questions.set(slot.slot, slot.question);
      else this.questions.delete(slot.slot);
      this.duts.set(slot.slot, slot.dut);
    }
    this.show();
  }

  connected(there) {
    this.there = there;
    this.showState();
  }

  choose(slot) {
    this.chosen = this.questions.has(slot) ? slot : null;
    this.show();
    this.field.focus();
  }

  unchoose() {
    this.chosen = null;
    this.field.value = '';
    this.show();
  }

  oldestFirst() {
    return [...this.questions].sort((one, other) => one[1].asked - other[1].asked);
  }

  show() {
    if (this.chosen && !this.questions.has(this.chosen)) this.chosen = null;
    const order = this.oldestFirst();
    const [slot, question] = order.find(([name]) => name === this.chosen) || order[0] || ['', null];
    const id = question ? question.id : '';
    if (id !== (this.current ? this.current.id : '')) this.change(slot, question);
    this.showOthers(order.map(([name]) => name).filter((name) => name !== slot));
    this.onShown(slot, order.length);
  }

  change(slot, question) {
    this.current = question ? { ...question, slot } : null;
    say(byId('who-slot'), question ? word('slot', { slot }) : '');
    say(byId('who-dut'), question ? this.duts.get(slot) : '');
    say(byId('question'), question ? question.text : word('desk.nothing'));
    this.complain('');
    byId('desk').dataset.kind = question ? question.kind : 'none';
    byId('choice').hidden = !question || question.kind !== 'yes-no';
    say(byId('field-label'), this.label(question));
    this.showPicture(question);
    this.settled = false;
    clearTimeout(this.settling);
    this.settling = setTimeout(() => {
      this.settled = true;
      this.showState();
    }, SETTLE);
    this.showState();
  }

  label(question) {
    if (!question) return word('field');
    return word(question.kind === 'yes-no' ? 'field.yes-no' : 'field.scan');
  }

  showPicture(question) {
    const button = byId('picture-button');
    button.hidden = !question || !question.picture;
    if (button.hidden) {
      byId('picture').removeAttribute('src');
      if (byId('picture-dialog').open) byId('picture-dialog').close();
      return;
    }
    byId('picture').alt = word('picture.of', { name: question.picture });
    byId('picture-large').alt = byId('picture').alt;
    byId('picture').src = `/picture/${encodeURIComponent(question.id)}`;
  }

  showOthers(names) {
    byId('others').hidden = names.length === 0;
    const list = byId('others-list');
    if (list.dataset.names === names.join('\n')) return;
    list.dataset.names = names.join('\n');
    list.replaceChildren(...names.map((name) => {
      const button = make('button', '', name);
      button.type = 'button';
      button.setAttribute('aria-label', `${word('desk.choose')}: ${word('slot', { slot: name })}`);
      button.addEventListener('click', () => this.choose(name));
      return button;
    }));
  }

  showState() {
    const ready = this.there && this.settled && !this.sending;
    byId('yes').disabled = !ready;
    byId('no').disabled = !ready;
    byId('desk').dataset.ready = String(Boolean(ready && this.current));
  }

  complain(text) {
    say(byId('message'), text);
  }

  // A line belongs to the question that was shown when its first character came.
  bind() {
    if (!this.field.value) this.meant = null;
    else if (!this.meant) this.meant = { id: this.current ? this.current.id : '' };
  }

  enter() {
    const text = this.field.value.trim();
    const meant = this.meant ? this.meant.id : '';
    this.field.value = '';
    this.meant = null;
    if (!text) return;
    if (!this.current) {
      this.complain(word('problem.nothing', { text }));
    } else if (meant !== this.current.id) {
      this.complain(word('problem.changed', { text }));
    } else if (this.current.kind === 'yes-no') {
      const answer = meaning(text);
      if (answer) this.answer(answer);
      else this.complain(word('problem.yes-no', { text }));
    } else {
      this.answer(text);
    }
  }

  async answer(text) {
    const question = this.current;
    if (!question || this.sending || !this.settled || !this.there) {
      if (question) this.complain(word('problem.early', { text }));
      return;
    }
    this.sending = true;
    this.complain('');
    this.showState();
    const result = await post('/answer', { id: question.id, text });
    this.sending = false;
    if (this.current === question && !result.ok) this.complain(problem(result, text));
    this.showState();
    this.field.focus();
  }
}

function problem(result, text) {
  return word(`problem.${result.problem}`, { text, reason: result.text });
}

// Whether a text says yes or no, in this language or in the plan's.
export function meaning(text) {
  const small = text.toLowerCase();
  if (['yes', 'y', word('yes').toLowerCase(), ...word('yes.keys')].includes(small)) return 'yes';
  if (['no', 'n', word('no').toLowerCase(), ...word('no.keys')].includes(small)) return 'no';
  return '';
}
