'use strict';
// What the operator says, sent to the station.

const PATIENCE = 10000;

let token = '';

export function useToken(given) {
  token = given;
}

// Gives {ok, problem, text}; problem is "gone", "unfit" or "unreachable".
export async function post(path, document) {
  try {
    const response = await fetch(path, {
      method: 'POST',
      headers: { 'Content-Type': 'application/json', 'X-AMT-Token': token },
      body: JSON.stringify(document),
      signal: AbortSignal.timeout(PATIENCE),
    });
    if ([200, 409, 422].includes(response.status)) return await response.json();
  } catch (error) {
    // told below
  }
  return { ok: false, problem: 'unreachable', text: '' };
}
