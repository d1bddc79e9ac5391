// How clients authenticate (RFC 6749, section 2.3).

import assert from 'node:assert/strict';
import { after, afterEach, before, test } from 'node:test';

import { allowed, issued, refresh, exchangeCode } from './code_flow.mjs';
import { clientPaths } from './endpoints.mjs';
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
afterEach(() => server.clear());

const scope = 'read write profile';
const inForm = ({ id, secret }) => ({ client_id: id, client_secret: secret });
const header = (text) => ({ authorization: `Basic ${Buffer.from(text).toString('base64')}` });

// Sends the same wrong credentials to every endpoint where clients authenticate.
async function refusedEverywhere(parameters, headers, status, error) {
  const { code } = await allowed(server, album);
  const { access_token: token } = await issued(server, album);
  await leavesNoTrace(server, async () => {
    assertRefused(await exchangeCode(server, album, code, parameters, headers), status, error);
    for (const path of clientPaths)
      assertRefused(await post(server, path, { token, ...parameters }, headers), status, error);
  });
}

test('clients authenticate by header or by form', async () => {
  for (const [changes, headers] of [
    [{}, basic(album)],
    [inForm(album), {}],
    [{ client_id: album.id }, basic(album)],
  ]) {
    const { code } = await allowed(server, album);
    assertTokens(await exchangeCode(server, album, code, changes, headers), { scope });
  }
});

test('the header is accepted in any case and with percent encoding', async () => {
  const escaped = (text) => text.replace(/./g, (c) => `%${c.charCodeAt(0).toString(16)}`);
  for (const headers of [
    { authorization: basic(album).authorization.replace('Basic', 'bAsIc') },
    header(`${escaped(album.id)}:${escaped(album.secret)}`),
  ]) {
    const { code } = await allowed(server, album);
    assertTokens(await exchangeCode(server, album, code, {}, headers), { scope });
  }
});

const wrong = {
  'no credentials': [{}, {}],
  'no secret': [{ client_id: 'ALBUM' }, {}],
  'an empty secret': [{ client_id: 'ALBUM', client_secret: '' }, {}],
  'a wrong secret': [{ client_id: 'ALBUM', client_secret: 'f'.repeat(64) }, {}],
  'the beginning of the secret': [{ client_id: 'ALBUM', client_secret: 'SHORT' }, {}],
  'the secret of another client': [{ client_id: 'ALBUM', client_secret: 'OTHER' }, {}],
  'an unknown client': [{ client_id: 'f'.repeat(64), client_secret: 'f'.repeat(64) }, {}],
  'a quote in the client': [{ client_id: "' OR '1'='1", client_secret: 'x' }, {}],
  'a wrong secret in the header': [{}, 'ALBUM:x'],
  'an empty header': [{}, ':'],
  'no colon in the header': [{}, 'ALBUM'],
  'a broken escape in the header': [{}, 'ALBUM:%4'],
  'a NUL byte in the header': [{}, 'ALBUM:SECRET\0'],
};
const fill = (text) =>
  text
    .replace('ALBUM', album.id)
    .replace('SECRET', album.secret)
    .replace('SHORT', album.secret.slice(0, 63))
    .replace('OTHER', printer.secret);
for (const [what, [parameters, text]] of Object.entries(wrong)) {
  test(`wrong credentials are refused with invalid_client: ${what}`, async () => {
    const filled = Object.fromEntries(
      Object.entries(parameters).map(([name, value]) => [name, fill(value)]),
    );
    const headers = typeof text === 'string' ? header(fill(text)) : {};
    await refusedEverywhere(filled, headers, 401, 'invalid_client');
  });
}

test('headers without basic authentication are refused with invalid_client', async () => {
  for (const authorization of [
    'Basic',
    'Basic ',
    'Basic ???',
    'Bearer x',
    'Negotiate x',
    basic(album).authorization.slice(6),
  ])
    await refusedEverywhere({}, { authorization }, 401, 'invalid_client');
});

test('both ways at once are refused with invalid_request', async () => {
  await refusedEverywhere(inForm(album), basic(album), 400, 'invalid_request');
  await refusedEverywhere({ client_id: printer.id }, basic(album), 400, 'invalid_request');
});

test('a repeated secret is refused with invalid_request', async () => {
  const { code } = await allowed(server, album);
  const parameters = Object.entries({
    grant_type: 'authorization_code',
    code,
    redirect_uri: album.redirectUri,
    ...inForm(album),
  });
  await leavesNoTrace(server, async () =>
    assertRefused(
      await post(server, '/token', [...parameters, ['client_secret', 'x']]),
      400,
      'invalid_request',
    ),
  );
});

test('a disabled client cannot use its codes and tokens', async () => {
  const { code } = await allowed(server, printer);
  const tokens = await issued(server, printer);
  server.oauthctl('client', 'disable', printer.id);
  await leavesNoTrace(server, async () => {
    assertRefused(await exchangeCode(server, printer, code), 401, 'invalid_client');
    assertRefused(await refresh(server, printer, tokens.refresh_token), 401, 'invalid_client');
    for (const path of clientPaths)
      assertRefused(
        await post(server, path, { token: tokens.access_token }, basic(printer)),
        401,
        'invalid_client',
      );
  });
  server.oauthctl('client', 'enable', printer.id);
  assertTokens(await exchangeCode(server, printer, code), { scope: 'read' });
});

test('failed authentication is in the audit log without the secret', async () => {
  await post(server, '/token', { client_id: 'someone<b>', client_secret: 'tell nobody' });
  const log = server.log().join('\n');
  assert.match(log, /client authentication failed for "someone\\x3cb\\x3e" from 127\.0\.0\.1/);
  assert.ok(!log.includes('tell nobody'));
});
