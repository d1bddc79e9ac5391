// Assertions about whole outcomes.

import assert from 'node:assert/strict';

const opaque = /^[0-9a-f]{64}$/;

export function assertNotStored(answer) {
  assert.equal(answer.headers['cache-control'], 'no-store');
  assert.equal(answer.headers.pragma, 'no-cache');
}

// Tokens (RFC 6749, section 5.1).
export function assertTokens(answer, { scope, lifetime = 600 }) {
  assert.equal(answer.status, 200, answer.text);
  assertNotStored(answer);
  const { access_token: access, refresh_token: refresh, ...rest } = answer.json;
  assert.match(access, opaque);
  assert.match(refresh, opaque);
  assert.notEqual(access, refresh);
  assert.deepEqual(rest, { token_type: 'Bearer', expires_in: lifetime, scope });
}

// A refusal in JSON (RFC 6749, section 5.2).
export function assertRefused(answer, status, error) {
  assert.equal(answer.status, status, answer.text);
  assertNotStored(answer);
  assert.equal(answer.headers['content-type'], 'application/json');
  assert.deepEqual(Object.keys(answer.json).sort(), ['error', 'error_description']);
  assert.equal(answer.json.error, error);
  assert.match(answer.json.error_description, /^[\x20\x21\x23-\x5b\x5d-\x7e]+$/);
  assert.equal(answer.headers['www-authenticate']?.startsWith('Basic ') ?? false, status === 401);
  assert.equal(answer.headers['retry-after'] !== undefined, status === 503);
}

// An error page of this server, without a redirect.
export function assertErrorPage(answer, status) {
  assert.equal(answer.status, status, answer.text);
  assertNotStored(answer);
  assert.equal(answer.headers['content-type'], 'text/html; charset=utf-8');
  assert.equal(answer.headers.location, undefined);
  assert.equal(answer.headers['set-cookie'], undefined);
  assert.match(
    answer.headers['content-security-policy'],
    /^default-src 'none'; .*form-action 'none'$/,
  );
  assert.match(answer.text, /<h1>This does not work<\/h1>/);
}

// An error that goes to the client by redirect (RFC 6749, section 4.1.2.1, and RFC 9207); state is
// null if the answer has none.
export function assertRedirected(
  answer,
  server,
  client,
  error,
  { status = 302, state = 'as it was' } = {},
) {
  assert.equal(answer.status, status, answer.text);
  assert.equal(answer.headers['cache-control'], 'no-store');
  const location = new URL(answer.headers.location);
  assert.equal(location.origin + location.pathname, client.redirectUri);
  const { error_description: description, ...rest } = Object.fromEntries(location.searchParams);
  assert.match(description, /^[\x20\x21\x23-\x5b\x5d-\x7e]+$/);
  assert.deepEqual(rest, { error, ...(state !== null && { state }), iss: server.issuer });
}

// The web server itself refuses the request.
export function assertBadRequest(answer) {
  assert.equal(answer.status, 400, answer.text);
  assert.equal(answer.headers.location, undefined);
  assert.match(answer.text, /400 Bad Request/);
}

// Asserts that the action issues, spends and revokes nothing.
export async function leavesNoTrace(server, action) {
  const before = server.rows();
  const result = await action();
  assert.deepEqual(server.rows(), before);
  return result;
}
