'use strict';
// A value that is not within its limits, drawn against them.

const SVG = 'http://www.w3.org/2000/svg';

function number(value) {
  return Number.parseFloat(Number(value).toPrecision(10)).toString();
}

function part(parent, tag, attributes, text = '') {
  const element = document.createElementNS(SVG, tag);
  for (const [name, value] of Object.entries(attributes)) element.setAttribute(name, value);
  element.textContent = text;
  parent.append(element);
  return element;
}

// Places on the bar, from 0 to 100: the limits lie at 25 and 75.
function places(value, low, high) {
  const from = low ?? high;
  const width = low !== undefined && high !== undefined ? (high - low) || 1
    : Math.max(Math.abs(value - from) * 1.25, Math.abs(from) * 0.25) || 1;
  const start = low ?? high - width;
  const at = (place) => 25 + (50 * (place - start)) / width;
  return {
    low: low === undefined ? 0 : at(low),
    high: high === undefined ? 100 : at(high),
    mark: Math.min(98, Math.max(2, at(value))),
  };
}

export function drawBar(value) {
  const { min, max } = value.limits;
  if (typeof value.value !== 'number' || (min === undefined && max === undefined)) return null;
  const place = places(value.value, min, max);
  const svg = document.createElementNS(SVG, 'svg');
  svg.setAttribute('viewBox', '0 0 100 26');
  svg.setAttribute('class', 'limit-bar');
  svg.setAttribute('role', 'img');
  svg.setAttribute('aria-label', value.reason);
  part(svg, 'rect', { x: 0, y: 13, width: 100, height: 4, class: 'outside' });
  part(svg, 'rect', { x: place.low, y: 11, width: place.high - place.low, height: 8, class: 'inside' });
  part(svg, 'path', { d: `M${place.mark} 10l-3.2 -5h6.4zM${place.mark - 0.8} 9h1.6v12h-1.6z`, class: 'mark' });
  if (min !== undefined) part(svg, 'text', { x: place.low, y: 26, 'text-anchor': 'middle' }, number(min));
  if (max !== undefined) part(svg, 'text', { x: place.high, y: 26, 'text-anchor': 'middle' }, number(max));
  return svg;
}
