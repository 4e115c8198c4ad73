'use strict';
// The connection to the station: told what has changed since, and found again when it is lost.

const SILENCE = 12000; // ms; the server says something every five seconds
const FIRST_PAUSE = 500;
const LONGEST_PAUSE = 5000;
const LOOKS_BEFORE_ASKING = 3;

export class Stream {
  constructor(listeners) {
    this.listeners = listeners; // snapshot, change, lost(ended)
    this.seen = '';
    this.failures = 0;
    this.ended = false;
    this.open();
    addEventListener('online', () => this.again(0));
  }

  open() {
    this.source = new EventSource(this.seen ? `/live?since=${this.seen}` : '/live');
    for (const kind of ['snapshot', 'change', 'beat', 'bye']) {
      this.source.addEventListener(kind, (event) => this.take(kind, event));
    }
    this.source.addEventListener('error', () => this.lose(false));
    this.watch();
  }

  watch() {
    clearTimeout(this.timer);
    this.timer = setTimeout(() => this.lose(false), SILENCE);
  }

  take(kind, event) {
    this.watch();
    if (kind === 'bye') {
      this.lose(true);
      return;
    }
    this.failures = 0;
    this.ended = false;
    this.seen = event.lastEventId;
    if (kind !== 'beat') this.listeners[kind](JSON.parse(event.data));
  }

  lose(ended) {
    this.ended = this.ended || ended;
    this.failures += 1;
    this.listeners.lost(this.ended);
    if (this.failures % LOOKS_BEFORE_ASKING === 0) askWhetherLetIn();
    this.again(Math.min(LONGEST_PAUSE, FIRST_PAUSE * 2 ** (this.failures - 1)));
  }

  again(pause) {
    if (this.source.readyState === EventSource.OPEN && pause === 0) return;
    this.source.close();
    clearTimeout(this.timer);
    this.timer = setTimeout(() => this.open(), pause);
  }
}

// A station that wants another token than ours shows its entrance instead.
function askWhetherLetIn() {
  fetch('/live', { method: 'HEAD' }).then((response) => {
    if (response.status === 401) location.reload();
  }, () => {});
}
