// A database that another process keeps locked: the answer is "try again".

import assert from 'node:assert/strict';
import { after, afterEach, before, test } from 'node:test';
import { setTimeout as sleep } from 'node:timers/promises';

import { atConsent, allowed, authorizeUrl, issued, refresh, exchangeCode } from './code_flow.mjs';
import { FormBrowser } from './form_browser.mjs';
import { basic, bearer, post, request } from './http.mjs';
import { assertErrorPage, assertRedirected, assertRefused, assertTokens } from './outcomes.mjs';
import { photoAlbum, Server } from './server.mjs';

let server, album;
before(async () => {
  server = await Server.start();
  album = server.addClient({ ...photoAlbum, scope: 'read profile' });
});
after(() => server.stop(/^authserver: the database did not open \[-1\] Create table failed$/));
afterEach(() => server.clear());

const userinfo = (token) => request(`${server.issuer}/userinfo`, { headers: bearer(token) });
const introspect = (token) => post(server, '/introspect', { token }, basic(album));
const revoke = (token) => post(server, '/revoke', { token }, basic(album));

// Runs the requests at the same time. Each of them waits for five seconds or more.
async function whileLocked(begin, requests) {
  const lock = await server.lockDatabase(begin);
  try {
    return await Promise.all(requests.map((send) => send()));
  } finally {
    await lock.release();
  }
}

function assertBusy(answers) {
  for (const answer of answers) {
    assertRefused(answer, 503, 'temporarily_unavailable');
    assert.match(answer.headers['retry-after'], /^[1-9]\d*$/);
  }
}

function assertBusyPage(answer) {
  assertErrorPage(answer, 503);
  assert.match(answer.headers['retry-after'], /^[1-9]\d*$/);
}

test('a locked database is 503 at every endpoint and spends nothing', async () => {
  const { code } = await allowed(server, album);
  const tokens = await issued(server, album);
  const browser = await atConsent(server, album);
  const before = server.rows();
  const [page, form, ...answers] = await whileLocked('BEGIN EXCLUSIVE', [
    () => new FormBrowser(server).open(authorizeUrl(album)),
    () => browser.submit('Allow'),
    () => exchangeCode(server, album, code),
    () => refresh(server, album, tokens.refresh_token),
    () => introspect(tokens.access_token),
    () => revoke(tokens.access_token),
    () => userinfo(tokens.access_token),
  ]);
  assertBusyPage(page);
  assertBusyPage(form);
  assertBusy(answers);
  assert.deepEqual(server.rows(), before);

  assertTokens(await exchangeCode(server, album, code), { scope: 'read profile' });
  assert.equal((await userinfo(tokens.access_token)).status, 200);
  assertTokens(await refresh(server, album, tokens.refresh_token), { scope: 'read profile' });
});

test('a database that cannot be written is 503 for requests that spend or issue', async () => {
  const { code } = await allowed(server, album);
  const tokens = await issued(server, album);
  const browser = await atConsent(server, album);
  const before = server.rows();
  const [form, user, active, ...answers] = await whileLocked('BEGIN IMMEDIATE', [
    () => browser.submit('Allow'),
    () => userinfo(tokens.access_token),
    () => introspect(tokens.access_token),
    () => exchangeCode(server, album, code),
    () => refresh(server, album, tokens.refresh_token),
    () => revoke(tokens.access_token),
  ]);
  assertRedirected(form, server, album, 'temporarily_unavailable', { status: 303 });
  assert.equal(user.status, 200); // it only reads
  assert.equal(active.json.active, true);
  assertBusy(answers);
  assert.deepEqual(server.rows(), before);
  assertTokens(await exchangeCode(server, album, code), { scope: 'read profile' });
});

// Every code was exchanged, or is still valid.
async function assertExchangedOrValid(codes, answers) {
  const busy = answers.filter((answer) => answer.status === 503);
  assertBusy(busy);
  for (const answer of answers)
    if (answer.status !== 503) assertTokens(answer, { scope: 'read profile' });
  const { codes: left, tokens } = server.rows();
  assert.deepEqual(
    left.map((row) => row.code).sort(),
    codes.filter((_, i) => answers[i].status === 503).sort(),
  );
  assert.equal(tokens.length, codes.length - busy.length);
  for (const { code } of left)
    assertTokens(await exchangeCode(server, album, code), { scope: 'read profile' });
}

async function someCodes(count) {
  const codes = [];
  while (codes.length < count) codes.push((await allowed(server, album)).code);
  return codes;
}

test('a lock that begins while codes are exchanged loses none of them', async () => {
  const codes = await someCodes(16);
  const exchanges = codes.map(async (code, i) => {
    await sleep(8 * i);
    return exchangeCode(server, album, code);
  });
  await sleep(40);
  const lock = await server.lockDatabase('BEGIN EXCLUSIVE');
  const answers = await Promise.all(exchanges);
  await lock.release();
  await assertExchangedOrValid(codes, answers);
});

test('an exchange whose commit fails is 503 and the code stays valid', async () => {
  const codes = await someCodes(1);
  const reader = await server.lockDatabase('BEGIN; SELECT count(*) FROM oauth_token');
  const answer = await exchangeCode(server, album, codes[0]); // a reader blocks only the commit
  await reader.release();
  assertBusy([answer]);
  await assertExchangedOrValid(codes, [answer]);
});

test('a lock shorter than the wait causes no error', async () => {
  const { code } = await allowed(server, album);
  const lock = await server.lockDatabase('BEGIN EXCLUSIVE');
  const pending = exchangeCode(server, album, code);
  setTimeout(() => lock.release(), 1500);
  assertTokens(await pending, { scope: 'read profile' });
});
