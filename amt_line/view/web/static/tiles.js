'use strict';
// All tiles, as large as they can be without being scrolled.

import { byId } from './dom.js';
import { Tile } from './tile.js';

// A tile is read best when it is about this much wider than high.
const BEST_SHAPE = 1.35;

export class Tiles {
  constructor(ask) {
    this.ask = ask;
    this.place = byId('tiles');
    this.tiles = new Map();
    new ResizeObserver(() => this.lay()).observe(this.place);
    setInterval(() => this.tiles.forEach((tile) => tile.began !== null && tile.tick()), 500);
  }

  // Show the slots given; with `only` there are no others.
  show(slots, only) {
    if (only) {
      const names = new Set(slots.map((slot) => slot.slot));
      for (const [name, tile] of this.tiles) {
        if (!names.has(name)) {
          tile.element.remove();
          this.tiles.delete(name);
        }
      }
    }
    for (const slot of slots) {
      let tile = this.tiles.get(slot.slot);
      if (!tile) {
        tile = new Tile(slot.slot, this.ask);
        this.tiles.set(slot.slot, tile);
        this.place.append(tile.element);
      }
      tile.show(slot);
    }
    byId('empty').hidden = this.tiles.size > 0;
    this.lay();
  }

  mark(name) {
    this.tiles.forEach((tile, slot) => tile.element.classList.toggle('at-desk', slot === name));
  }

  lay() {
    const { clientWidth: width, clientHeight: height } = this.place;
    const count = this.tiles.size;
    if (!count || !height) return;
    let best = { size: 0, columns: 1 };
    for (let columns = 1; columns <= count; columns += 1) {
      const rows = Math.ceil(count / columns);
      const size = Math.min(width / columns / BEST_SHAPE, height / rows);
      if (size > best.size) best = { size, columns };
    }
    this.place.style.setProperty('--columns', best.columns);
    this.place.style.setProperty('--rows', Math.ceil(count / best.columns));
    document.body.classList.toggle('many', count > 9);
  }
}
