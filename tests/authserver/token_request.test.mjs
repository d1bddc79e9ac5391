// POST /token with a code (RFC 6749, sections 4.1.3 and 5; RFC 7636).

import assert from 'node:assert/strict';
import { after, afterEach, before, test } from 'node:test';

import { allowed, issued, pkce, exchangeCode, withChallenge } from './code_flow.mjs';
import { basic, post } from './http.mjs';
import { assertRefused, assertTokens, leavesNoTrace } from './outcomes.mjs';
import { photoAlbum, printShop, Server } from './server.mjs';

let server, album, printer;
before(async () => {
  server = await Server.start();
  album = server.addClient(photoAlbum);
  printer = server.addClient(printShop);
});
after(() => server.stop());
afterEach(() => {
  server.set({});
  server.clear();
});

test('a code is exchanged for tokens once and deleted', async () => {
  const { code } = await allowed(server, album);
  const answer = await exchangeCode(server, album, code);
  assertTokens(answer, { scope: 'read write profile' });
  const { codes, tokens } = server.rows();
  assert.deepEqual(codes, []);
  assert.equal(tokens.length, 1);
  assert.equal(tokens[0].username, 'alice');
  assert.equal(tokens[0].client_id, album.id);
  assert.equal(tokens[0].scope, 'read write profile');
  assert.equal(tokens[0].access_token, answer.json.access_token);
  assert.equal(tokens[0].refresh_token, answer.json.refresh_token);
  assert.ok(Math.abs(Number(tokens[0].expired_time) - Date.now() / 1000 - 600) < 10);
});

test('a replayed code is refused and ends the tokens issued for it', async () => {
  const kept = await issued(server, album);
  const { access_token: access, code } = await issued(server, album);
  assertRefused(await exchangeCode(server, album, code), 400, 'invalid_grant');
  assert.deepEqual(
    server.rows().tokens.map((row) => row.access_token),
    [kept.access_token],
  );
  assert.notEqual(kept.access_token, access);
  assert.ok(
    server
      .log()
      .includes('authserver: code replayed, tokens revoked of "Photo album" from 127.0.0.1'),
  );
});

test('a code that another client replays ends no tokens', async () => {
  const { code } = await issued(server, album);
  await leavesNoTrace(server, async () =>
    assertRefused(await exchangeCode(server, printer, code), 400, 'invalid_grant'),
  );
});

test('a stolen code without its verifier is refused and stays valid for its owner', async () => {
  const { verifier, challenge } = pkce();
  const { code } = await allowed(server, album, withChallenge({ challenge }));
  await leavesNoTrace(server, async () =>
    assertRefused(await exchangeCode(server, album, code), 400, 'invalid_grant'),
  );
  assertTokens(await exchangeCode(server, album, code, { code_verifier: verifier }), {
    scope: 'read write profile',
  });
});

test('a wrong verifier is refused and spends the code', async () => {
  for (const wrong of [pkce().verifier, 'x', 'x'.repeat(4096)]) {
    const { verifier, challenge } = pkce();
    const { code } = await allowed(server, album, withChallenge({ challenge }));
    assertRefused(
      await exchangeCode(server, album, code, { code_verifier: wrong }),
      400,
      'invalid_grant',
    );
    assert.deepEqual(server.rows(), { codes: [], tokens: [] });
    assertRefused(
      await exchangeCode(server, album, code, { code_verifier: verifier }),
      400,
      'invalid_grant',
    );
    assert.deepEqual(server.rows(), { codes: [], tokens: [] });
  }
});

test('the challenge is not accepted as its verifier', async () => {
  const { challenge } = pkce();
  const { code } = await allowed(server, album, withChallenge({ challenge }));
  assertRefused(
    await exchangeCode(server, album, code, { code_verifier: challenge }),
    400,
    'invalid_grant',
  );
  assert.deepEqual(server.rows(), { codes: [], tokens: [] });
});

test('a verifier for a code without a challenge is refused', async () => {
  const { code } = await allowed(server, album);
  await leavesNoTrace(server, async () =>
    assertRefused(
      await exchangeCode(server, album, code, { code_verifier: pkce().verifier }),
      400,
      'invalid_grant',
    ),
  );
});

test('the code of another client is refused and stays valid for its owner', async () => {
  const { code } = await allowed(server, album);
  await leavesNoTrace(server, async () => {
    assertRefused(await exchangeCode(server, printer, code), 400, 'invalid_grant');
    assertRefused(
      await exchangeCode(server, printer, code, { redirect_uri: album.redirectUri }),
      400,
      'invalid_grant',
    );
  });
  assertTokens(await exchangeCode(server, album, code), { scope: 'read write profile' });
});

test('another redirect URI than that of the request is refused', async () => {
  const { code } = await allowed(server, album);
  await leavesNoTrace(server, async () => {
    for (const uri of [
      'http://album.example/callback',
      'https://album.example/',
      'https://evil.example/',
      'x',
    ])
      assertRefused(
        await exchangeCode(server, album, code, { redirect_uri: uri }),
        400,
        'invalid_grant',
      );
    for (const uri of [undefined, ''])
      assertRefused(
        await exchangeCode(server, album, code, { redirect_uri: uri }),
        400,
        'invalid_request',
      );
  });
});

test('an expired code is refused', async () => {
  const { code } = await allowed(server, album);
  server.sql("UPDATE oauth_grantCode SET expired_time = strftime('%s', 'now') - 1");
  await leavesNoTrace(server, async () =>
    assertRefused(await exchangeCode(server, album, code), 400, 'invalid_grant'),
  );
});

test('an unknown code is refused', async () => {
  await leavesNoTrace(server, async () => {
    for (const code of [
      'x',
      '0'.repeat(64),
      '0'.repeat(65),
      "' OR '1'='1",
      '%',
      '_'.repeat(64),
      '\u20ac',
    ])
      assertRefused(await exchangeCode(server, album, code), 400, 'invalid_grant');
  });
});

test('a code that cannot be spent gives no tokens', async () => {
  const { code } = await allowed(server, album);
  server.sql(
    'CREATE TRIGGER keep BEFORE DELETE ON oauth_grantCode BEGIN SELECT RAISE(IGNORE); END',
  );
  await leavesNoTrace(server, async () =>
    assertRefused(await exchangeCode(server, album, code), 400, 'invalid_grant'),
  );
  server.sql('DROP TRIGGER keep');
  assertTokens(await exchangeCode(server, album, code), { scope: 'read write profile' });
});

test('a missing or repeated parameter is refused and spends nothing', async () => {
  const { code } = await allowed(server, album);
  const full = { grant_type: 'authorization_code', code, redirect_uri: album.redirectUri };
  await leavesNoTrace(server, async () => {
    for (const name of Object.keys(full)) {
      assertRefused(
        await post(server, '/token', { ...full, [name]: undefined }, basic(album)),
        400,
        'invalid_request',
      );
      assertRefused(
        await post(server, '/token', { ...full, [name]: '' }, basic(album)),
        400,
        'invalid_request',
      );
      const twice = [...Object.entries(full), [name, full[name]]];
      assertRefused(await post(server, '/token', twice, basic(album)), 400, 'invalid_request');
    }
  });
});

test('other grant types are refused', async () => {
  for (const type of [
    'password',
    'client_credentials',
    'urn:ietf:params:oauth:grant-type:device_code',
    'Authorization_Code',
  ])
    assertRefused(
      await post(
        server,
        '/token',
        { grant_type: type, username: 'alice', password: 'x' },
        basic(album),
      ),
      400,
      'unsupported_grant_type',
    );
});

test('tokens live as long as the settings say', async () => {
  server.set({ token_expired: 42 });
  const { code } = await allowed(server, album);
  assertTokens(await exchangeCode(server, album, code), { scope: 'read write profile', lifetime: 42 });
});
