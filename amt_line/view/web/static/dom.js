'use strict';
// Elements by id, and new ones. Whatever a handset says gets in as text, never as markup.

export function byId(id) {
  return document.getElementById(id);
}

export function make(tag, name = '', text = '') {
  const element = document.createElement(tag);
  if (name) element.className = name;
  if (text) element.textContent = text;
  return element;
}

export function say(element, text) {
  if (element.textContent !== text) element.textContent = text;
}

export function shape(name) {
  return byId(`shape-${name}`).content.firstElementChild.cloneNode(true);
}
