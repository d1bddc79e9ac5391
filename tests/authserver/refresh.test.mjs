// POST /token with a refresh token (RFC 6749, section 6).

import assert from 'node:assert/strict';
import { after, afterEach, before, test } from 'node:test';

import { issued, refresh, exchangeCode } from './code_flow.mjs';
import { bearer, request } from './http.mjs';
import { assertRefused, assertTokens, leavesNoTrace } from './outcomes.mjs';
import { photoAlbum, printShop, Server } from './server.mjs';

let server, album, printer;
before(async () => {
  server = await Server.start();
  album = server.addClient(photoAlbum);
  printer = server.addClient(printShop);
});
after(() => server.stop());
afterEach(() => server.clear());

test('a refresh token is exchanged once for new tokens, which replace the old ones', async () => {
  const old = await issued(server, album);
  const answer = await refresh(server, album, old.refresh_token);
  assertTokens(answer, { scope: 'read write profile' });
  const { tokens } = server.rows();
  assert.equal(tokens.length, 1);
  assert.equal(tokens[0].access_token, answer.json.access_token);
  assert.equal(tokens[0].refresh_token, answer.json.refresh_token);
  assert.equal(tokens[0].username, 'alice');
  assert.notEqual(answer.json.refresh_token, old.refresh_token);
  const userinfo = (token) => request(`${server.issuer}/userinfo`, { headers: bearer(token) });
  assert.equal((await userinfo(old.access_token)).status, 401);
  assert.equal((await userinfo(answer.json.access_token)).status, 200);
  await leavesNoTrace(server, async () =>
    assertRefused(await refresh(server, album, old.refresh_token), 400, 'invalid_grant'),
  );
});

test('a login can be refreshed after its access token has expired', async () => {
  const old = await issued(server, album);
  server.sql("UPDATE oauth_token SET expired_time = strftime('%s', 'now') - 86400");
  assertTokens(await refresh(server, album, old.refresh_token), { scope: 'read write profile' });
});

test('a refresh may narrow the scope and widen it again up to what was granted', async () => {
  const first = await issued(server, album, { scope: 'read profile' });
  const narrow = await refresh(server, album, first.refresh_token, { scope: 'read' });
  assertTokens(narrow, { scope: 'read' });
  const wide = await refresh(server, album, narrow.json.refresh_token);
  assertTokens(wide, { scope: 'read profile' });
});

test('a refresh for more than was granted is refused and the refresh token stays valid', async () => {
  const first = await issued(server, album, { scope: 'read' });
  await leavesNoTrace(server, async () => {
    for (const scope of ['read write', 'write', 'profile', 'admin', 'READ', 'read"'])
      assertRefused(
        await refresh(server, album, first.refresh_token, { scope }),
        400,
        'invalid_scope',
      );
  });
  assertTokens(await refresh(server, album, first.refresh_token), { scope: 'read' });
});

test('the refresh token of another client is refused and stays valid for its owner', async () => {
  const { refresh_token: token } = await issued(server, album);
  await leavesNoTrace(server, async () =>
    assertRefused(await refresh(server, printer, token), 400, 'invalid_grant'),
  );
  assertTokens(await refresh(server, album, token), { scope: 'read write profile' });
});

test('a refresh token that cannot be spent gives no tokens', async () => {
  const { refresh_token: token } = await issued(server, album);
  server.sql('CREATE TRIGGER keep BEFORE DELETE ON oauth_token BEGIN SELECT RAISE(IGNORE); END');
  await leavesNoTrace(server, async () =>
    assertRefused(await refresh(server, album, token), 400, 'invalid_grant'),
  );
  server.sql('DROP TRIGGER keep');
  assertTokens(await refresh(server, album, token), { scope: 'read write profile' });
});

test('an access token and a refresh token cannot replace each other', async () => {
  const tokens = await issued(server, album);
  await leavesNoTrace(server, async () => {
    assertRefused(await refresh(server, album, tokens.access_token), 400, 'invalid_grant');
    const answer = await request(`${server.issuer}/userinfo`, {
      headers: bearer(tokens.refresh_token),
    });
    assert.equal(answer.status, 401);
  });
});

test('an unknown or missing refresh token is refused', async () => {
  for (const token of ['x', '0'.repeat(64), '0'.repeat(65), "' OR '1'='1", '%'])
    assertRefused(await refresh(server, album, token), 400, 'invalid_grant');
  for (const token of [undefined, ''])
    assertRefused(await refresh(server, album, token), 400, 'invalid_request');
});

test('a replayed code ends its tokens also after a refresh', async () => {
  const old = await issued(server, album);
  const answer = await refresh(server, album, old.refresh_token);
  assert.equal(answer.status, 200);
  assertRefused(await exchangeCode(server, album, old.code), 400, 'invalid_grant');
  assert.deepEqual(server.rows().tokens, []);
});
