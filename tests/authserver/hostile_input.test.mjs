// Input that no honest client sends. It crashes nothing and changes no row.

import assert from 'node:assert/strict';
import { after, afterEach, before, beforeEach, test } from 'node:test';

import { allowed, atConsent, authorizeUrl, issued, exchangeCode } from './code_flow.mjs';
import { clientPaths } from './endpoints.mjs';
import { basic, bearer, encoded, post, raw, request } from './http.mjs';
import {
  assertBadRequest,
  assertErrorPage,
  assertRedirected,
  assertRefused,
  assertTokens,
} from './outcomes.mjs';
import { photoAlbum, Server } from './server.mjs';

let server, album, kept;
before(async () => {
  server = await Server.start();
  album = server.addClient(photoAlbum);
});
after(() => server.stop(/request-size too long|oversized request-header/));
beforeEach(async () => {
  await allowed(server, album); // a code and a token that must stay
  await issued(server, album);
  kept = server.rows();
});
afterEach(() => {
  assert.deepEqual(server.rows(), kept);
  server.clear();
});

const form = 'application/x-www-form-urlencoded';
const credentials = () => encoded({ client_id: album.id, client_secret: album.secret });

test('bodies that are not forms are refused', async () => {
  const types = [
    undefined,
    '',
    'application/json',
    'text/plain',
    'multipart/form-data; boundary=x',
    `${form}x`,
    `x${form}`,
    'application/x-www-form-urlencoded, text/plain',
  ];
  for (const path of clientPaths)
    for (const type of types) {
      const headers = type === undefined ? {} : { 'content-type': type };
      const answer = await request(server.issuer + path, {
        method: 'POST',
        headers,
        body: `${credentials()}&token=x`,
      });
      assertRefused(answer, 400, 'invalid_request');
    }
});

test('a form with a charset is accepted', async () => {
  const answer = await post(
    server,
    '/introspect',
    { token: 'x' },
    { ...basic(album), 'content-type': `${form}; charset=UTF-8` },
  );
  assert.deepEqual([answer.status, answer.json], [200, { active: false }]);
});

test('bodies over the limit are refused with 413', async () => {
  for (const path of [...clientPaths, '/authorize'])
    for (const size of [65537, 70000, 1000000]) {
      const answer = await post(server, path, `token=${'x'.repeat(size - 6)}`, basic(album));
      assert.equal(answer.status, 413, `${path} ${size}`);
      assert.equal(answer.headers.location, undefined);
    }
});

test('a large announced length is refused with 413, whatever follows its digits', () => {
  for (const length of ['70000', '70000x', '+70000', ' 70000', '99999999999999999999x']) {
    const answer = server.runProgram('revoke', {
      REQUEST_METHOD: 'POST',
      CONTENT_TYPE: form,
      CONTENT_LENGTH: length,
    });
    assert.match(answer, /^Status: 413\b/m, length);
  }
});

test('a value over the limit is refused', async () => {
  for (const path of clientPaths) {
    assertRefused(
      await post(server, path, { token: 'x'.repeat(4097) }, basic(album)),
      400,
      'invalid_request',
    );
    assertRefused(
      await post(server, path, `${'x'.repeat(65)}=1`, basic(album)),
      400,
      'invalid_request',
    );
    assertRefused(
      await post(server, path, { token: 'x'.repeat(60000) }, basic(album)),
      400,
      'invalid_request',
    );
  }
  assertRedirected(
    await request(server.issuer + authorizeUrl(album, { state: 'x'.repeat(4097) })),
    server,
    album,
    'invalid_request',
    { state: null },
  );
  assertRedirected(
    await request(server.issuer + authorizeUrl(album, { nonce: 'x'.repeat(4097) })),
    server,
    album,
    'invalid_request',
  );
  assertErrorPage(
    await request(server.issuer + authorizeUrl({ ...album, id: 'x'.repeat(4097) })),
    400,
  );
});

test('a thousand parameters are refused', async () => {
  const many = 'a=1&'.repeat(1000);
  for (const path of clientPaths)
    assertRefused(await post(server, path, `${many}${credentials()}`), 400, 'invalid_request');
});

test('unknown parameters are ignored', async () => {
  assert.equal(
    (await request(server.issuer + authorizeUrl(album, { nonce: 'x', prompt: '', 'a b': '&' })))
      .status,
    200,
  );
  assert.equal(
    (await post(server, '/introspect', { token: 'x', extra: '1' }, basic(album))).status,
    200,
  );
});

test('parameters in the query of a POST are refused', async () => {
  for (const path of clientPaths)
    assertRefused(
      await post(server, `${path}?${credentials()}`, { token: 'x' }, basic(album)),
      400,
      'invalid_request',
    );
});

// Bodies of forms that are malformed or unusual.
const malformed = [
  '%',
  '%4',
  '%zz',
  'a=%',
  'a=%4',
  'a=%zz',
  '%=%',
  '=',
  '&',
  '&&&',
  '=&=',
  '==',
  'a',
  'a=b=c',
  '%00=x',
  'token=%00',
  'token=%0d%0aSet-Cookie:%20a=b',
  'token=%ff%fe',
  'token=%c0%af',
  'token=%ed%a0%80',
  'token=\xff',
  `token=${'%41'.repeat(1500)}`,
  '%ff=%ff',
  'client_id[]=x',
  '\0',
  '\x01\x02',
  '+'.repeat(1000),
];
test('malformed forms are refused or ignored', async () => {
  for (const path of clientPaths)
    for (const text of malformed) {
      const answer = await post(server, path, text, basic(album));
      assert.ok(
        [200, 400].includes(answer.status),
        `${path} ${JSON.stringify(text)}: ${answer.status} ${answer.text}`,
      );
      if (answer.status === 400) assertRefused(answer, 400, 'invalid_request');
      assert.equal(answer.headers['set-cookie'], undefined);
    }
});

test('malformed forms do not log in, allow or deny', async () => {
  const browser = await atConsent(server, album);
  for (const text of malformed) {
    const answer = await browser.open('/authorize', {
      method: 'POST',
      headers: { 'content-type': form },
      body: text,
    });
    assertErrorPage(answer, 400);
  }
});

test('malformed queries are refused and do not redirect', async () => {
  for (const text of malformed.filter((text) => !/[\0-\x1f]/.test(text))) {
    const answer = await raw(server, `GET /authorize?${text} HTTP/1.0\r\n\r\n`);
    assert.equal(answer.status, 400, text);
    assert.doesNotMatch(answer.text, /^(location|set-cookie):/im, text);
  }
});

test('truncated escapes in a value are refused or kept', async () => {
  for (const state of ['%', '%4', '%zz', 'a%', '%%%']) {
    const answer = await request(
      `${server.issuer}${authorizeUrl(album, { state: undefined })}&state=${state}`,
    );
    if (answer.status === 302)
      assertRedirected(answer, server, album, 'invalid_request', { state: null });
    else if (answer.status === 400) assertBadRequest(answer);
    else assert.equal(answer.status, 200, state);
  }
});

test('invalid UTF-8 is refused or shown as text, never as markup', async () => {
  for (const bytes of ['%ff', '%c0%bc', '%c3', '%ed%a0%80', '%f8%88%80%80%80']) {
    const answer = await request(
      `${server.issuer}${authorizeUrl(album, { state: undefined })}&state=${bytes}`,
    );
    assert.ok([200, 302, 400].includes(answer.status), `${bytes}: ${answer.status}`);
    assert.equal(answer.text.match(/</g)?.length, answer.text.match(/>/g)?.length);
  }
});

test('control characters in a parameter are refused', async () => {
  for (const path of clientPaths)
    for (const character of ['\0', '\n', '\r', '\t', '\x1b', '\x7f'])
      assertRefused(
        await post(server, path, { token: `x${character}y` }, basic(album)),
        400,
        'invalid_request',
      );
});

test('requests that are not valid HTTP are refused by the web server', async () => {
  const length =
    'POST /token HTTP/1.1\r\nHost: x\r\nContent-Type: application/x-www-form-urlencoded\r\nContent-Length:';
  const requests = [
    'GET\r\n\r\n',
    '\0\0\0\0\r\n\r\n',
    'GET /authorize HTTP/9.9\r\n\r\n',
    'GET /authorize?\0 HTTP/1.0\r\n\r\n',
    'GET /authorize?\xff\0 HTTP/1.0\r\n\r\n',
    `${length} -1\r\n\r\n`,
    `${length} 1e3\r\n\r\n`,
    `${length} 5\r\nContent-Length: 6\r\n\r\nabcdef`,
    `${length} 99999999999999999999\r\n\r\n`,
    `${length} 4\r\nTransfer-Encoding: chunked\r\n\r\n0\r\n\r\n`,
    `GET /userinfo HTTP/1.0\r\nAuthorization: ${'x'.repeat(60000)}\r\n\r\n`,
    `GET /${'x'.repeat(100000)} HTTP/1.0\r\n\r\n`,
  ];
  for (const bytes of requests) {
    const answer = await raw(server, Buffer.from(bytes, 'latin1'));
    assert.ok(
      [0, 400, 413, 414, 431, 501, 505].includes(answer.status),
      `${JSON.stringify(bytes.slice(0, 90))}: ${answer.text}`,
    );
  }
});

test('a body shorter than its Content-Length issues no tokens', async () => {
  const [{ code }] = kept.codes;
  const body = encoded({ grant_type: 'authorization_code', code, redirect_uri: album.redirectUri });
  const head = `POST /token HTTP/1.0\r\nContent-Type: ${form}\r\nAuthorization: ${basic(album).authorization}\r\n`;
  const answer = await raw(server, `${head}Content-Length: ${body.length + 10}\r\n\r\n${body}`);
  assert.doesNotMatch(answer.text, /access_token/);
});

test('a chunked body is read like any other', async () => {
  const { code } = await allowed(server, album);
  const body = encoded({ grant_type: 'authorization_code', code, redirect_uri: album.redirectUri });
  const head = `POST /token HTTP/1.1\r\nHost: x\r\nConnection: close\r\nContent-Type: ${form}\r\nAuthorization: ${basic(album).authorization}\r\n`;
  const answer = await raw(
    server,
    `${head}Transfer-Encoding: chunked\r\n\r\n${body.length.toString(16)}\r\n${body}\r\n0\r\n\r\n`,
  );
  assert.equal(answer.status, 200, answer.text);
  kept = server.rows();
  assert.equal(kept.tokens.length, 2);
});

test('headers cannot change the folder of the server', async () => {
  const hostile = {
    AUTHSERVER_FOLDER: '/tmp',
    'authserver-folder': '/tmp',
    'http-authserver-folder': '/tmp',
    authserver_templates: '/tmp',
    proxy: 'http://evil.example',
    'x-forwarded-for': '203.0.113.9',
    'x-forwarded-host': 'evil.example',
    host: 'evil.example',
  };
  const answer = await request(`${server.issuer}/.well-known/oauth-authorization-server`, {
    headers: hostile,
  });
  assert.equal(answer.json.issuer, server.issuer);
  const browser = await atConsent(server, album);
  const { location } = await browser.open('/authorize', {
    method: 'POST',
    headers: { ...hostile, 'content-type': form },
    body: encoded(browser.fields({ action: 'allow' })),
  });
  assert.equal(location.searchParams.get('iss'), server.issuer);
  assert.equal(server.rows().codes.at(-1).ip, '127.0.0.1');
  assertTokens(await exchangeCode(server, album, location.searchParams.get('code')), {
    scope: 'read write profile',
  });
  kept = server.rows();
});

test('oversized bearer tokens and cookies are refused or ignored', async () => {
  const token = await request(`${server.issuer}/userinfo`, { headers: bearer('x'.repeat(6000)) });
  assert.equal(token.status, 401);
  const cookie = Array.from({ length: 200 }, (_, i) => `authserver=${i}`).join('; ');
  const page = await request(server.issuer + authorizeUrl(album), { headers: { cookie } });
  assert.equal(page.status, 200);
  assert.match(page.text, /<h1>Log in<\/h1>/);
});
