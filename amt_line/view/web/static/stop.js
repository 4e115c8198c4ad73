'use strict';
// Stopping a slot, asked once more: a run that is stopped is lost.

import { byId, say } from './dom.js';
import { post } from './post.js';
import { word } from './words.js';

export class Stop {
  constructor(slots, news) {
    this.slots = slots;
    this.news = news;
    this.dialog = byId('stop-dialog');
    this.dialog.addEventListener('close', () => this.close());
  }

  ask(name) {
    const slot = this.slots.get(name);
    if (!slot) return;
    this.meant = { slot: name, run: slot.run };
    say(byId('stop-question'), word('stop.question', { slot: name, dut: slot.dut }));
    this.dialog.returnValue = 'no';
    this.dialog.showModal();
  }

  // What was asked about may have ended by itself meanwhile.
  look() {
    if (!this.dialog.open) return;
    const slot = this.slots.get(this.meant.slot);
    if (!slot || slot.run !== this.meant.run) this.dialog.close('no');
  }

  async close() {
    byId('field').focus();
    if (this.dialog.returnValue !== 'yes') return;
    const result = await post('/stop', this.meant);
    if (!result.ok) this.news(word('problem.stop'));
  }
}
