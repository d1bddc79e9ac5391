// Scripts in every field that comes from outside. browser.test.mjs tests them in a real browser.

import assert from 'node:assert/strict';
import { after, before, test } from 'node:test';

import { atConsent, authorizeUrl, issued, logIn } from './code_flow.mjs';
import { attribute, elements, FormBrowser, textOf } from './form_browser.mjs';
import { basic, bearer, post, request } from './http.mjs';
import { assertErrorPage } from './outcomes.mjs';
import { Server } from './server.mjs';

const script = `"'><script>alert(1)</script><img src=x onerror=alert(1)>`;
const named = `"'><script>alert(1)</script>{{CLIENT}}&amp;`; // without an image, because names are short
const mallory = { name: `m${script}`, displayName: `Mallory ${script}`, password: 'open sesame 8' };
let server, client;
before(async () => {
  server = await Server.start();
  server.addUser(mallory);
  client = server.addClient({
    redirectUri: 'https://album.example/callback?"\'><script>alert(1)</script>',
    scope: 'profile <script>alert(1)</script>',
    name: named,
  });
});
after(() => server.stop());

function assertHarmless({ document, headers, text }) {
  const allowed = new Set([
    'html',
    'head',
    'meta',
    'link',
    'title',
    'body',
    'main',
    'form',
    'input',
    'h1',
    'h2',
    'p',
    'strong',
    'button',
    'ul',
    'li',
    'div',
    'label',
    'code',
  ]);
  for (const element of elements(document)) {
    assert.ok(allowed.has(element.tagName), `<${element.tagName}> in: ${text}`);
    for (const { name } of element.attrs)
      assert.doesNotMatch(name, /^on|^style$|^src$|^srcdoc$|^formaction$/);
    assert.ok(!/^\s*javascript:/i.test(attribute(element, 'href') ?? ''));
  }
  assert.match(
    headers['content-security-policy'],
    /^default-src 'none'; style-src 'self'; base-uri 'none'; frame-ancestors 'none'; form-action /,
  );
  assert.equal(headers['x-content-type-options'], 'nosniff');
  assert.equal(headers['referrer-policy'], 'no-referrer');
}

const only = (document, tag) => [...elements(document)].find((element) => element.tagName === tag);

test('scripts in client name, state, scope and user are text on the login and consent pages', async () => {
  const browser = new FormBrowser(server);
  const login = await browser.open(authorizeUrl(client, { state: script }));
  assertHarmless(login);
  assert.ok(textOf(only(login.document, 'title')).includes(named));
  assert.equal(browser.fields().state, script);
  assert.equal(browser.fields().redirect_uri, client.redirectUri);

  const failed = await browser.submit('Log in', { username: script, password: 'x' });
  assertHarmless(failed);
  assert.equal(browser.fields().username, script);

  const consent = await logIn(browser, mallory);
  assertHarmless(consent);
  assert.equal(textOf(only(consent.document, 'h1')), `Allow ${named}?`);
  assert.ok(consent.text.includes('Mallory'));
  const wishes = [...elements(consent.document)]
    .filter((element) => element.tagName === 'li')
    .map(textOf);
  assert.deepEqual(wishes, ['Know your name', '<script>alert(1)</script>']);
  assert.ok(
    [...elements(consent.document)].some((element) => textOf(element) === mallory.displayName),
  );

  const { location } = await browser.submit('Allow');
  assert.equal(location.searchParams.get('state'), script);
  server.clear();
});

test('scripts in every parameter of a refused request are text on the error page', async () => {
  for (const name of ['client_id', 'redirect_uri', 'response_type', 'scope', 'state', script]) {
    const browser = new FormBrowser(server);
    const page = await browser.open(authorizeUrl({ ...client, id: 'unknown' }, { [name]: script }));
    assertErrorPage(page, 400);
    assertHarmless(page);
  }
});

test('the policy allows forms to this server and the client only', async () => {
  const { page } = await atConsent(server, client, {}, mallory);
  assert.equal(
    page.headers['content-security-policy'],
    "default-src 'none'; style-src 'self'; base-uri 'none'; frame-ancestors 'none'; " +
      "form-action 'self' https://album.example",
  );
});

test('scripts in JSON answers stay JSON', async () => {
  const { access_token: token } = await issued(server, client, {}, mallory);
  const answer = await request(`${server.issuer}/userinfo`, { headers: bearer(token) });
  assert.equal(answer.headers['content-type'], 'application/json');
  assert.equal(answer.headers['x-content-type-options'], 'nosniff');
  assert.deepEqual(answer.json, { sub: mallory.name, name: mallory.displayName });
  const { json } = await post(server, '/introspect', { token }, basic(client));
  assert.equal(json.username, mallory.name);
  assert.equal(json.scope, client.scope);
  server.clear();
});
