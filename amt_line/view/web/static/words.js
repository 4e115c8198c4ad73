'use strict';
// The words of the page's language, as the server chose it.

const words = JSON.parse(document.getElementById('words').textContent);

export function word(key, values = {}) {
  return words[key].replace(/\{(\w+)\}/g, (_, name) => values[name]);
}

export function has(key) {
  return key in words;
}
