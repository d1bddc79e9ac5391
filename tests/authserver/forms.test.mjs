// POST /authorize: login, the decision, and forms of other sites.

import assert from 'node:assert/strict';
import { after, afterEach, before, test } from 'node:test';

import { allowed, atConsent, authorizeUrl, logIn } from './code_flow.mjs';
import { attribute, elements, FormBrowser } from './form_browser.mjs';
import { assertErrorPage, assertRedirected, leavesNoTrace } from './outcomes.mjs';
import { alice, photoAlbum, printShop, Server } from './server.mjs';

const bob = { name: 'bob', displayName: "Bob O'Neil", password: 'another sesame' };
let server, album, printer;
before(async () => {
  server = await Server.start();
  server.addUser(bob);
  album = server.addClient(photoAlbum);
  printer = server.addClient(printShop);
});
after(() => server.stop());
afterEach(() => server.clear());

async function atLogin(client = album, changes = {}) {
  const browser = new FormBrowser(server);
  await browser.open(authorizeUrl(client, changes));
  return browser;
}

function assertLoginFailed(browser, name) {
  const { status, text, document } = browser.page;
  assert.equal(status, 200);
  assert.match(text, /<h1>Log in<\/h1>/);
  const byId = (id) => [...elements(document)].find((element) => attribute(element, 'id') === id);
  assert.equal(attribute(byId('problem'), 'role'), 'alert');
  assert.equal(attribute(byId('username'), 'value'), name);
  assert.equal(attribute(byId('username'), 'aria-describedby'), 'problem');
  assert.equal(attribute(byId('password'), 'value'), undefined);
}

test('a wrong password, an unknown user and an empty field get the same page', async () => {
  await leavesNoTrace(server, async () => {
    const attempts = [
      ['alice', 'wrong'],
      ['nobody', alice.password],
      ['', ''],
      ['alice', ''],
      ['', alice.password],
      ['alice', `${alice.password} `],
      ['Alice', alice.password],
      ["alice' --", alice.password],
    ];
    for (const [name, password] of attempts) {
      const browser = await atLogin();
      await browser.submit('Log in', { username: name, password });
      assertLoginFailed(browser, name);
      await browser.open(authorizeUrl(album));
      assert.match(browser.page.text, /<h1>Log in<\/h1>/);
    }
  });
});

test('a failed login is in the audit log without its password', async () => {
  const browser = await atLogin();
  await browser.submit('Log in', { username: '<b>mallory</b>', password: 'tell nobody' });
  await browser.submit('Log in', { username: 'mallory', password: 'tell nobody' });
  const log = server.log();
  assert.ok(log.includes('authserver: login failed for "mallory" from 127.0.0.1'), log.join('\n'));
  assert.ok(!log.join('\n').includes('tell nobody'));
  assert.ok(!log.join('\n').includes('<b>'));
});

test('login gives a new session', async () => {
  const browser = await atLogin();
  const [before] = browser.page.headers['set-cookie'];
  const answer = await browser.post('/authorize', {
    ...browser.fields(),
    username: alice.name,
    password: alice.password,
    action: 'login',
  });
  assert.match(answer.text, /Alice Miller/);
  const other = new FormBrowser(server); // with the cookie from before the login
  const page = await other.open(authorizeUrl(album), { headers: { cookie: before.split(';')[0] } });
  assert.match(page.text, /<h1>Log in<\/h1>/);
});

test('allowing issues a code and nothing else', async () => {
  const browser = await atConsent(server, album);
  const answer = await browser.submit('Allow');
  assert.equal(answer.status, 303);
  assert.equal(answer.headers['cache-control'], 'no-store');
  const { code, ...rest } = Object.fromEntries(answer.location.searchParams);
  assert.deepEqual(rest, { state: 'as it was', iss: server.issuer });
  const { codes, tokens } = server.rows();
  assert.deepEqual(tokens, []);
  assert.equal(codes.length, 1);
  const { username, client_id: client, scope, ip } = codes[0];
  assert.deepEqual(
    { code: codes[0].code, username, client, scope, ip },
    { code, username: 'alice', client: album.id, scope: 'read write profile', ip: '127.0.0.1' },
  );
});

test('denying sends access_denied and issues nothing', async () => {
  const browser = await atConsent(server, album);
  const answer = await leavesNoTrace(server, () => browser.submit('Deny'));
  assertRedirected(answer, server, album, 'access_denied', { status: 303 });
});

test('another account can be used instead', async () => {
  const browser = await atConsent(server, album);
  await browser.submit('Not you?');
  assert.match(browser.page.text, /<h1>Log in<\/h1>/);
  await logIn(browser, bob);
  assert.match(browser.page.text, /Bob O(&#39;|')Neil/);
  await browser.submit('Allow');
  assert.deepEqual(
    server.rows().codes.map((row) => row.username),
    ['bob'],
  );
});

test('a form with a missing, changed or foreign CSRF field does nothing', async () => {
  const stranger = await atConsent(server, album);
  const otherRequest = await atConsent(server, album, { scope: 'read' });
  const browser = await atConsent(server, album);
  const consent = browser.fields({ action: 'allow' });
  const foreign = [
    undefined,
    '',
    'x',
    consent.csrf.slice(1),
    `${consent.csrf}A`,
    consent.csrf.toUpperCase(),
    stranger.fields().csrf,
    otherRequest.fields().csrf,
  ];
  await leavesNoTrace(server, async () => {
    for (const csrf of foreign)
      for (const action of ['allow', 'deny', 'switch', 'login'])
        assertErrorPage(await browser.post('/authorize', { ...consent, action, csrf }), 403);
  });
  assert.equal((await browser.post('/authorize', consent)).status, 303); // the correct form still works
});

test('a login form of another site does not log in', async () => {
  const attacker = await atLogin();
  const victim = await atLogin();
  const answer = await victim.post('/authorize', {
    ...attacker.fields(),
    username: alice.name,
    password: alice.password,
    action: 'login',
  });
  assertErrorPage(answer, 403);
  await victim.open(authorizeUrl(album));
  assert.match(victim.page.text, /<h1>Log in<\/h1>/);
});

test('a form without its cookie does nothing', async () => {
  const browser = await atConsent(server, album);
  const consent = browser.fields({ action: 'allow' });
  browser.forgetCookies();
  await leavesNoTrace(server, async () =>
    assertErrorPage(await browser.post('/authorize', consent), 403),
  );
});

test('a changed request in the consent form does nothing', async () => {
  const browser = await atConsent(server, printer, { scope: 'read' });
  const consent = browser.fields({ action: 'allow' });
  const changes = [
    { client_id: album.id, redirect_uri: album.redirectUri },
    { scope: 'read write' },
    { state: 'mine' },
    { code_challenge: 'x'.repeat(43), code_challenge_method: 'S256' },
    { response_type: undefined },
  ];
  await leavesNoTrace(server, async () => {
    for (const change of changes)
      assertErrorPage(await browser.post('/authorize', { ...consent, ...change }), 403);
    assertErrorPage(
      await browser.post('/authorize', { ...consent, redirect_uri: 'https://evil.example/' }),
      400,
    );
  });
});

test('allow before login only shows the login page', async () => {
  const browser = await atLogin();
  await leavesNoTrace(server, async () => {
    const answer = await browser.post('/authorize', browser.fields({ action: 'allow' }));
    assert.equal(answer.status, 200);
    assert.match(answer.text, /<h1>Log in<\/h1>/);
  });
});

test('a client that is disabled before the decision gets no code', async () => {
  const browser = await atConsent(server, printer);
  server.oauthctl('client', 'disable', printer.id);
  await leavesNoTrace(server, async () => assertErrorPage(await browser.submit('Allow'), 400));
  server.oauthctl('client', 'enable', printer.id);
});

test('a changed or forged cookie gives no session', async () => {
  const browser = await atConsent(server, album);
  const header = browser.page.headers['set-cookie']?.[0] ?? '';
  assert.equal(header, ''); // the consent page sets no cookie
  const user = Buffer.from('alice').toString('base64url');
  for (const cookie of [
    `${user}.9999999999.0.`,
    `${user}.9999999999.${'0'.repeat(32)}.${'A'.repeat(43)}`,
    '...',
    '.',
    '',
    'x'.repeat(5000),
  ]) {
    const page = await new FormBrowser(server).open(authorizeUrl(album), {
      headers: { cookie: `authserver=${cookie}` },
    });
    assert.equal(page.status, 200);
    assert.match(page.text, /<h1>Log in<\/h1>/);
  }
});

test('the same user can log in on many devices', async () => {
  const codes = [await allowed(server, album), await allowed(server, album)].map(
    (answer) => answer.code,
  );
  assert.equal(new Set(codes).size, 2);
  assert.equal(server.rows().codes.length, 2);
});
