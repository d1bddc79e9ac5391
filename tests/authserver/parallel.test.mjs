// Many requests at once: a code or refresh token is spent once, and independent requests succeed.

import assert from 'node:assert/strict';
import { after, afterEach, before, test } from 'node:test';

import { allowed, issued, pkce, refresh, exchangeCode, withChallenge } from './code_flow.mjs';
import { bearer, request } from './http.mjs';
import { assertRefused, assertTokens } from './outcomes.mjs';
import { alice, photoAlbum, Server } from './server.mjs';

let server, album;
before(async () => {
  server = await Server.start();
  album = server.addClient({ ...photoAlbum, scope: 'read profile' });
});
after(() => server.stop());
afterEach(() => server.clear());

const rounds = 10;
const eight = (action) => Promise.all(Array.from({ length: 8 }, action));

function assertOneWon(answers) {
  const won = answers.filter((answer) => answer.status === 200);
  assert.deepEqual(answers.map((answer) => answer.status).sort(), [200, ...Array(7).fill(400)]);
  assertTokens(won[0], { scope: 'read profile' });
  for (const answer of answers) if (answer !== won[0]) assertRefused(answer, 400, 'invalid_grant');
  return won[0].json;
}

test('of 8 requests that use one code at once exactly one wins', async () => {
  for (let round = 0; round < rounds; ++round) {
    const { code } = await allowed(server, album);
    assertOneWon(await eight(() => exchangeCode(server, album, code)));
    // The others replayed the code, which ends the winner's tokens.
    assert.deepEqual(server.rows(), { codes: [], tokens: [] });
  }
});

test('of 8 requests that use one refresh token at once exactly one wins', async () => {
  for (let round = 0; round < rounds; ++round) {
    const { refresh_token: token } = await issued(server, album);
    const winner = assertOneWon(await eight(() => refresh(server, album, token)));
    const { tokens } = server.rows();
    assert.deepEqual(
      tokens.map((row) => row.access_token),
      [winner.access_token],
    );
    server.clear();
  }
});

test('8 requests that use the refresh tokens of 8 logins at once all win', async () => {
  const logins = await eight(() => issued(server, album));
  const answers = await Promise.all(
    logins.map((login) => refresh(server, album, login.refresh_token)),
  );
  for (const answer of answers) assertTokens(answer, { scope: 'read profile' });
  assert.equal(server.rows().tokens.length, 8);
});

test('200 full logins at 8 in parallel all succeed', async (t) => {
  let left = 200;
  const seen = new Set();
  const started = performance.now();
  await eight(async () => {
    while (left-- > 0) {
      const { verifier, challenge } = pkce();
      const { code } = await allowed(server, album, withChallenge({ challenge }));
      const answer = await exchangeCode(server, album, code, { code_verifier: verifier });
      assertTokens(answer, { scope: 'read profile' });
      const user = await request(`${server.issuer}/userinfo`, {
        headers: bearer(answer.json.access_token),
      });
      assert.deepEqual(user.json, { sub: alice.name, name: alice.displayName });
      seen.add(answer.json.access_token).add(answer.json.refresh_token);
    }
  });
  const seconds = (performance.now() - started) / 1000;
  t.diagnostic(`200 logins in ${seconds.toFixed(1)} s, ${(200 / seconds).toFixed(1)} a second`);
  assert.equal(seen.size, 400);
  const { codes, tokens } = server.rows();
  assert.deepEqual([codes.length, tokens.length], [0, 200]);
});
