// Full tables: rows that are safe to purge are deleted; without any, the answer is "try again".

import assert from 'node:assert/strict';
import { after, afterEach, before, test } from 'node:test';

import { allowed, atConsent, issued, refresh, exchangeCode } from './code_flow.mjs';
import { assertRedirected, assertRefused, assertTokens, leavesNoTrace } from './outcomes.mjs';
import { photoAlbum, Server } from './server.mjs';

const scope = 'read profile';
let server, album;
before(async () => {
  server = await Server.start();
  album = server.addClient({ ...photoAlbum, scope });
});
after(() => server.stop());
afterEach(() => {
  server.set({});
  server.clear();
});

const expire = (table, token, ago) =>
  server.sql(
    `UPDATE oauth_${table} SET expired_time = strftime('%s', 'now', '${ago}') WHERE access_token = '${token}'`,
  );

test('a full table of codes loses the expired ones and takes a new one', async () => {
  for (let i = 0; i < 3; ++i) await allowed(server, album);
  server.set({ grantcode_max: 3 });
  server.sql("UPDATE oauth_grantCode SET expired_time = strftime('%s', 'now') - 1 WHERE id < 3");
  const { code } = await allowed(server, album);
  assert.equal(server.rows().codes.length, 2);
  assertTokens(await exchangeCode(server, album, code), { scope });
});

test('a full table of valid codes is temporarily_unavailable', async () => {
  for (let i = 0; i < 3; ++i) await allowed(server, album);
  server.set({ grantcode_max: 3 });
  const browser = await atConsent(server, album);
  const answer = await leavesNoTrace(server, () => browser.submit('Allow'));
  assertRedirected(answer, server, album, 'temporarily_unavailable', { status: 303 });
});

test('a full table of tokens loses those that expired a month ago and takes new ones', async () => {
  const long = await issued(server, album);
  const lately = await issued(server, album);
  const good = await issued(server, album);
  const { code } = await allowed(server, album);
  expire('token', long.access_token, '-31 days');
  expire('token', lately.access_token, '-29 days');
  server.set({ token_max: 3 });
  const answer = await exchangeCode(server, album, code);
  assertTokens(answer, { scope });
  assert.deepEqual(
    server
      .rows()
      .tokens.map((row) => row.access_token)
      .sort(),
    [lately.access_token, good.access_token, answer.json.access_token].sort(),
  );
  assertTokens(await refresh(server, album, lately.refresh_token), { scope });
});

test('a full table of tokens that are in use is 503 and the code stays valid', async () => {
  for (let i = 0; i < 3; ++i) await issued(server, album);
  const { code } = await allowed(server, album);
  server.set({ token_max: 3 });
  await leavesNoTrace(server, async () =>
    assertRefused(await exchangeCode(server, album, code), 503, 'temporarily_unavailable'),
  );
  server.set({});
  assertTokens(await exchangeCode(server, album, code), { scope });
});

test('codes and tokens both above their ceilings are 503 and every code stays valid', async () => {
  const codes = [];
  for (let i = 0; i < 2; ++i) await issued(server, album);
  for (let i = 0; i < 3; ++i) codes.push((await allowed(server, album)).code);
  server.set({ grantcode_max: 1, token_max: 1 });
  await leavesNoTrace(server, async () => {
    for (const code of codes)
      assertRefused(await exchangeCode(server, album, code), 503, 'temporarily_unavailable');
  });
  server.set({});
  for (const code of codes) assertTokens(await exchangeCode(server, album, code), { scope });
});

test('a refresh at the ceiling succeeds because it deletes a row first', async () => {
  const tokens = await issued(server, album);
  await issued(server, album);
  server.set({ token_max: 2 });
  assertTokens(await refresh(server, album, tokens.refresh_token), { scope });
  assert.equal(server.rows().tokens.length, 2);
});

test('a refresh above the ceiling is 503 and the refresh token stays valid', async () => {
  const tokens = await issued(server, album);
  await issued(server, album);
  await issued(server, album);
  server.set({ token_max: 1 });
  await leavesNoTrace(server, async () =>
    assertRefused(
      await refresh(server, album, tokens.refresh_token),
      503,
      'temporarily_unavailable',
    ),
  );
  server.set({});
  assertTokens(await refresh(server, album, tokens.refresh_token), { scope });
});
