// Two client libraries that other people wrote use everything that this server offers.

import assert from 'node:assert/strict';
import { webcrypto } from 'node:crypto';
import { after, afterEach, before, test } from 'node:test';

import { AuthorizationCode } from 'simple-oauth2';

import { logIn, pkce, withChallenge } from './code_flow.mjs';
import { FormBrowser } from './form_browser.mjs';
import { bearer, request } from './http.mjs';
import { alice, photoAlbum, Server } from './server.mjs';

globalThis.crypto ??= webcrypto; // node 18 does not define it
const oauth = await import('oauth4webapi');
const insecure = { [oauth.allowInsecureRequests]: true }; // allows http, on this machine

const scope = 'read profile';
let server, album;
before(async () => {
  server = await Server.start();
  album = server.addClient({ ...photoAlbum, scope });
});
after(() => server.stop());
afterEach(() => server.clear());

// Does what the user does. Returns the URL of the redirect to the client.
async function decided(url, button = 'Allow') {
  const browser = new FormBrowser(server);
  await browser.open(url);
  await logIn(browser);
  return (await browser.submit(button)).location;
}

async function discovered() {
  const issuer = new URL(server.issuer);
  const answer = await oauth.discoveryRequest(issuer, { algorithm: 'oauth2', ...insecure });
  return oauth.processDiscoveryResponse(issuer, answer);
}

const client = () => ({ client_id: album.id });

async function authorizationUrl(as, state, verifier) {
  const challenge =
    verifier === oauth.nopkce ? undefined : await oauth.calculatePKCECodeChallenge(verifier);
  const url = new URL(as.authorization_endpoint);
  const parameters = {
    response_type: 'code',
    client_id: album.id,
    redirect_uri: album.redirectUri,
    scope,
    state,
    ...(challenge && withChallenge({ challenge })),
  };
  for (const [key, value] of Object.entries(parameters)) url.searchParams.set(key, value);
  return url;
}

// The next three return the documents that oauth4webapi reads from the server's answers.

async function tokensForCode(as, secret, callback, verifier) {
  const answer = await oauth.authorizationCodeGrantRequest(
    as,
    client(),
    secret,
    callback,
    album.redirectUri,
    verifier,
    insecure,
  );
  return oauth.processAuthorizationCodeResponse(as, client(), answer);
}

async function tokensForRefresh(as, secret, token) {
  const answer = await oauth.refreshTokenGrantRequest(as, client(), secret, token, insecure);
  return oauth.processRefreshTokenResponse(as, client(), answer);
}

async function introspected(as, secret, token) {
  const answer = await oauth.introspectionRequest(as, client(), secret, token, insecure);
  return oauth.processIntrospectionResponse(as, client(), answer);
}

async function assertActive(as, secret, token) {
  const { exp, ...rest } = await introspected(as, secret, token);
  assert.ok(exp > Date.now() / 1000);
  assert.deepEqual(rest, {
    active: true,
    client_id: album.id,
    iss: server.issuer,
    scope,
    sub: 'alice',
    token_type: 'Bearer',
    username: 'alice',
  });
}

const authentications = { basic: oauth.ClientSecretBasic, post: oauth.ClientSecretPost };
for (const [name, authentication] of Object.entries(authentications))
  for (const challenged of [true, false]) {
    test(`oauth4webapi completes every step, secret by ${name}, ${challenged ? 'with' : 'without'} PKCE`, async () => {
      const as = await discovered();
      const secret = authentication(album.secret);
      const state = oauth.generateRandomState();
      const verifier = challenged ? oauth.generateRandomCodeVerifier() : oauth.nopkce;
      const location = await decided(await authorizationUrl(as, state, verifier));
      const callback = oauth.validateAuthResponse(as, client(), location, state);
      const first = await tokensForCode(as, secret, callback, verifier);
      assert.deepEqual([first.token_type, first.expires_in, first.scope], ['bearer', 600, scope]);

      const user = await oauth.userInfoRequest(as, client(), first.access_token, insecure);
      assert.deepEqual(await oauth.processUserInfoResponse(as, client(), 'alice', user), {
        sub: 'alice',
        name: alice.displayName,
      });

      const second = await tokensForRefresh(as, secret, first.refresh_token);
      assert.notEqual(second.access_token, first.access_token);
      assert.deepEqual(await introspected(as, secret, first.access_token), { active: false });
      await assertActive(as, secret, second.access_token);

      await oauth.processRevocationResponse(
        await oauth.revocationRequest(as, client(), secret, second.refresh_token, insecure),
      );
      assert.deepEqual(await introspected(as, secret, second.access_token), { active: false });
      assert.deepEqual(server.rows(), { codes: [], tokens: [] });
    });
  }

test('oauth4webapi accepts an answer only from the issuer that it asked', async () => {
  const as = await discovered();
  const location = await decided(
    `/authorize?response_type=code&client_id=${album.id}&redirect_uri=${encodeURIComponent(album.redirectUri)}`,
  );
  oauth.validateAuthResponse(as, client(), location, oauth.expectNoState);
  for (const iss of [undefined, 'https://evil.example']) {
    const forged = new URL(location);
    forged.searchParams.delete('iss');
    if (iss) forged.searchParams.set('iss', iss);
    assert.throws(() => oauth.validateAuthResponse(as, client(), forged, oauth.expectNoState), /iss/);
  }
});

test('oauth4webapi recognises a denial and a refused code by their error codes', async () => {
  const as = await discovered();
  const url = `/authorize?response_type=code&client_id=${album.id}&redirect_uri=${encodeURIComponent(album.redirectUri)}&state=s`;
  const denied = await decided(url, 'Deny');
  assert.throws(() => oauth.validateAuthResponse(as, client(), denied, 's'), {
    error: 'access_denied',
  });

  const callback = oauth.validateAuthResponse(as, client(), await decided(url), 's');
  const secret = oauth.ClientSecretBasic(album.secret);
  const exchange = () => tokensForCode(as, secret, callback, oauth.nopkce);
  await exchange();
  await assert.rejects(exchange, { error: 'invalid_grant', status: 400 });
});

test('oauth4webapi parses the challenge of userinfo', async () => {
  const as = await discovered();
  const answer = await oauth.userInfoRequest(as, client(), 'x'.repeat(64), insecure);
  await assert.rejects(
    oauth.processUserInfoResponse(as, client(), oauth.skipSubjectCheck, answer),
    (error) => {
      assert.equal(error.cause[0].scheme, 'bearer');
      assert.equal(error.cause[0].parameters.error, 'invalid_token');
      return true;
    },
  );
});

const simpleClient = (authorizationMethod) =>
  new AuthorizationCode({
    client: { id: album.id, secret: album.secret },
    auth: {
      tokenHost: server.issuer,
      tokenPath: '/token',
      authorizePath: '/authorize',
      revokePath: '/revoke',
    },
    options: { authorizationMethod },
  });

for (const authorizationMethod of ['header', 'body'])
  for (const challenged of [true, false]) {
    test(`simple-oauth2 completes every step, secret by ${authorizationMethod}, ${challenged ? 'with' : 'without'} PKCE`, async () => {
      const simple = simpleClient(authorizationMethod);
      const { verifier, challenge } = pkce();
      const url = simple.authorizeURL({
        redirect_uri: album.redirectUri,
        scope,
        state: 's',
        ...(challenged && withChallenge({ challenge })),
      });
      const callback = await decided(url);
      assert.equal(callback.searchParams.get('state'), 's');
      const first = await simple.getToken({
        code: callback.searchParams.get('code'),
        redirect_uri: album.redirectUri,
        ...(challenged && { code_verifier: verifier }),
      });
      assert.equal(first.expired(), false);
      assert.equal(first.token.scope, scope);

      const second = await first.refresh({ scope: 'profile' });
      assert.equal(second.token.scope, 'profile');
      await assert.rejects(
        first.refresh(),
        (error) => error.output.statusCode === 400 && error.data.payload.error === 'invalid_grant',
      );

      const user = () =>
        request(`${server.issuer}/userinfo`, { headers: bearer(second.token.access_token) });
      assert.deepEqual((await user()).json, { sub: 'alice', name: alice.displayName });
      await second.revokeAll();
      assert.equal((await user()).status, 401);
      assert.deepEqual(server.rows(), { codes: [], tokens: [] });
    });
  }
