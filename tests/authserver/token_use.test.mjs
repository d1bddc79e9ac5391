// The use of tokens: /userinfo (RFC 6750), /introspect (RFC 7662), /revoke (RFC 7009).

import assert from 'node:assert/strict';
import { readFileSync, writeFileSync } from 'node:fs';
import { after, afterEach, before, test } from 'node:test';

import { allowed, issued, refresh, exchangeCode } from './code_flow.mjs';
import { basic, bearer, post, request } from './http.mjs';
import { assertNotStored, assertRefused, leavesNoTrace } from './outcomes.mjs';
import { alice, photoAlbum, printShop, Server } from './server.mjs';

let server, album, printer, gateway;
before(async () => {
  server = await Server.start();
  album = server.addClient(photoAlbum);
  printer = server.addClient(printShop);
  gateway = server.addClient({
    redirectUri: 'https://gateway.example/',
    scope: 'introspect',
    name: 'Gateway',
  });
});
after(() => server.stop());
afterEach(() => server.clear());

// Runs the action while users.json has no users.
async function withoutUsers(action) {
  const file = '/var/authserver/users.json';
  const original = readFileSync(file, 'utf8');
  writeFileSync(file, JSON.stringify({ ...JSON.parse(original), users: {} }));
  await action();
  writeFileSync(file, original);
}

const userinfo = (headers) => request(`${server.issuer}/userinfo`, { headers });
const introspect = (client, token) => post(server, '/introspect', { token }, basic(client));
const revoke = (client, token, changes = {}) =>
  post(server, '/revoke', { token, ...changes }, basic(client));

function assertUnauthorized(answer, status, error) {
  assert.equal(answer.status, status, answer.text);
  assertNotStored(answer);
  assert.match(
    answer.headers['www-authenticate'],
    new RegExp(`^Bearer realm="authserver", error="${error}", error_description="[^"]+"`),
  );
  assert.equal(answer.json.error, error);
}

// A request without a token gets no error code.
function assertTokenNeeded(answer) {
  assert.equal(answer.status, 401);
  assertNotStored(answer);
  assert.equal(answer.headers['www-authenticate'], 'Bearer realm="authserver"');
  assert.equal(answer.text, '');
}

async function assertInactive(client, token) {
  const answer = await introspect(client, token);
  assert.equal(answer.status, 200);
  assertNotStored(answer);
  assert.deepEqual(answer.json, { active: false });
}

test('userinfo returns the name of the user for a token with the scope profile', async () => {
  const { access_token: token } = await issued(server, album);
  for (const headers of [bearer(token), { authorization: `bearer ${token}` }]) {
    const answer = await userinfo(headers);
    assert.equal(answer.status, 200);
    assertNotStored(answer);
    assert.deepEqual(answer.json, { sub: 'alice', name: alice.displayName });
  }
});

test('userinfo without a token answers with a challenge and no error code', async () => {
  assertTokenNeeded(await userinfo({}));
  assertTokenNeeded(await userinfo(basic(album)));
});

test('userinfo ignores a token in the query', async () => {
  const { access_token: token } = await issued(server, album);
  assertTokenNeeded(await request(`${server.issuer}/userinfo?access_token=${token}`));
});

test('userinfo refuses unknown and expired tokens with invalid_token', async () => {
  const { access_token: token } = await issued(server, album);
  const others = [
    'x',
    '0'.repeat(64),
    `${token}0`,
    token.slice(1),
    token.toUpperCase(),
    "' OR '1'='1",
  ];
  for (const other of others)
    assertUnauthorized(await userinfo(bearer(other)), 401, 'invalid_token');
  server.sql("UPDATE oauth_token SET expired_time = strftime('%s', 'now') - 1");
  assertUnauthorized(await userinfo(bearer(token)), 401, 'invalid_token');
});

test('userinfo refuses a token of narrower scope with insufficient_scope', async () => {
  const { access_token: token } = await issued(server, printer);
  assertUnauthorized(await userinfo(bearer(token)), 403, 'insufficient_scope');
});

test('the tokens of a disabled client are void', async () => {
  const tokens = await issued(server, album);
  server.oauthctl('client', 'disable', album.id);
  assertUnauthorized(await userinfo(bearer(tokens.access_token)), 401, 'invalid_token');
  await assertInactive(gateway, tokens.access_token);
  await assertInactive(gateway, tokens.refresh_token);
  server.oauthctl('client', 'enable', album.id);
});

test('the codes and tokens of a removed user are void', async () => {
  const { code } = await allowed(server, album);
  const tokens = await issued(server, album);
  await withoutUsers(() =>
    leavesNoTrace(server, async () => {
      assertRefused(await exchangeCode(server, album, code), 400, 'invalid_grant');
      assertRefused(await refresh(server, album, tokens.refresh_token), 400, 'invalid_grant');
      for (const token of [tokens.access_token, tokens.refresh_token]) {
        await assertInactive(album, token);
        await assertInactive(gateway, token);
      }
      assertUnauthorized(await userinfo(bearer(tokens.access_token)), 401, 'invalid_token');
    }),
  );
  assert.equal((await introspect(album, tokens.access_token)).json.active, true);
});

test('an expiry beyond 64 bits is in the far future at every endpoint', async () => {
  const { code } = await allowed(server, album);
  const { access_token: token } = await issued(server, album);
  for (const table of ['grantCode', 'token'])
    server.sql(`UPDATE oauth_${table} SET expired_time = '99999999999999999999'`);
  assert.equal((await userinfo(bearer(token))).status, 200);
  assert.deepEqual((await introspect(album, token)).text.match(/"exp":\d+|"active":\w+/g), [
    '"active":true',
    '"exp":9223372036854775807',
  ]);
  assert.equal((await exchangeCode(server, album, code)).status, 200);
});

test("introspection describes a client's own tokens", async () => {
  const tokens = await issued(server, album, { scope: 'read profile' });
  const common = {
    active: true,
    scope: 'read profile',
    client_id: album.id,
    username: 'alice',
    sub: 'alice',
    iss: server.issuer,
  };
  const access = await introspect(album, tokens.access_token);
  assertNotStored(access);
  const [row] = server.rows().tokens;
  assert.deepEqual(access.json, { ...common, token_type: 'Bearer', exp: Number(row.expired_time) });
  assert.deepEqual((await introspect(album, tokens.refresh_token)).json, common);
});

test('introspection describes tokens of other clients only to those registered for it', async () => {
  const tokens = await issued(server, album);
  await assertInactive(printer, tokens.access_token);
  await assertInactive(printer, tokens.refresh_token);
  assert.equal((await introspect(gateway, tokens.access_token)).json.active, true);
});

test('introspection describes a refresh token only to its own client', async () => {
  const tokens = await issued(server, album);
  await assertInactive(gateway, tokens.refresh_token);
  await assertInactive(printer, tokens.refresh_token);
  assert.equal((await introspect(album, tokens.refresh_token)).json.active, true);
});

test('introspection reports unknown, expired and spent tokens as inactive', async () => {
  const old = await issued(server, album);
  const { json: tokens } = await refresh(server, album, old.refresh_token);
  for (const token of [
    'x',
    '0'.repeat(64),
    "' OR '1'='1",
    old.access_token,
    old.refresh_token,
    old.code,
  ])
    await assertInactive(album, token);
  server.sql("UPDATE oauth_token SET expired_time = strftime('%s', 'now') - 1");
  await assertInactive(album, tokens.access_token);
  assert.equal((await introspect(album, tokens.refresh_token)).json.active, true);
});

test('revoking the access token or the refresh token ends both', async () => {
  for (const name of ['access_token', 'refresh_token']) {
    for (const hint of [undefined, 'access_token', 'refresh_token', 'nonsense']) {
      const kept = await issued(server, album);
      const tokens = await issued(server, album);
      const answer = await revoke(album, tokens[name], { token_type_hint: hint });
      assert.deepEqual([answer.status, answer.json], [200, {}]);
      assertNotStored(answer);
      assert.deepEqual(
        server.rows().tokens.map((row) => row.access_token),
        [kept.access_token],
      );
      assertUnauthorized(await userinfo(bearer(tokens.access_token)), 401, 'invalid_token');
      assertRefused(await refresh(server, album, tokens.refresh_token), 400, 'invalid_grant');
      server.clear();
    }
  }
});

test('revoking an unknown token succeeds', async () => {
  for (const token of ['x', '0'.repeat(64), "' OR '1'='1"])
    assert.equal((await revoke(album, token)).status, 200);
});

test('a client cannot revoke the tokens of another client', async () => {
  const tokens = await issued(server, album);
  await leavesNoTrace(server, async () => {
    for (const client of [printer, gateway])
      for (const name of ['access_token', 'refresh_token'])
        assertRefused(await revoke(client, tokens[name]), 400, 'invalid_grant');
  });
});

test('a missing or repeated token is refused', async () => {
  for (const path of ['/revoke', '/introspect']) {
    assertRefused(await post(server, path, {}, basic(album)), 400, 'invalid_request');
    assertRefused(
      await post(
        server,
        path,
        [
          ['token', 'x'],
          ['token', 'x'],
        ],
        basic(album),
      ),
      400,
      'invalid_request',
    );
  }
});
