// Two client libraries that know nothing of this server go through everything it offers.

import assert from 'node:assert/strict';
import { webcrypto } from 'node:crypto';
import { after, afterEach, before, test } from 'node:test';

import { AuthorizationCode } from 'simple-oauth2';

import { logIn, pkce, withChallenge } from './code_flow.mjs';
import { FormBrowser } from './form_browser.mjs';
import { bearer, request } from './http.mjs';
import { alice, photoAlbum, Server } from './server.mjs';

globalThis.crypto ??= webcrypto; // node 18 has none of its own
const oauth = await import('oauth4webapi');
const insecure = { [oauth.allowInsecureRequests]: true }; // http, on this machine

const scope = 'read profile';
let server, album;
before(async () => {
  server = await Server.start();
  album = server.addClient({ ...photoAlbum, scope });
});
after(() => server.stop());
afterEach(() => server.clear());

// The user's part: where the browser ends up.
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

const authentications = { basic: oauth.ClientSecretBasic, post: oauth.ClientSecretPost };
for (const [name, authentication] of Object.entries(authentications))
  for (const challenged of [true, false]) {
    test(`oauth4webapi goes through everything, secret by ${name}, ${challenged ? 'with' : 'without'} PKCE`, async () => {
      const as = await discovered();
      const client = { client_id: album.id };
      const secret = authentication(album.secret);
      const state = oauth.generateRandomState();
      const verifier = challenged ? oauth.generateRandomCodeVerifier() : oauth.nopkce;
      const url = new URL(as.authorization_endpoint);
      const parameters = {
        response_type: 'code',
        client_id: album.id,
        redirect_uri: album.redirectUri,
        scope,
        state,
      };
      if (challenged)
        Object.assign(
          parameters,
          withChallenge({ challenge: await oauth.calculatePKCECodeChallenge(verifier) }),
        );
      for (const [key, value] of Object.entries(parameters)) url.searchParams.set(key, value);

      const callback = oauth.validateAuthResponse(as, client, await decided(url), state);
      const answer = await oauth.authorizationCodeGrantRequest(
        as,
        client,
        secret,
        callback,
        album.redirectUri,
        verifier,
        insecure,
      );
      const first = await oauth.processAuthorizationCodeResponse(as, client, answer);
      assert.deepEqual([first.token_type, first.expires_in, first.scope], ['bearer', 600, scope]);

      const user = await oauth.userInfoRequest(as, client, first.access_token, insecure);
      assert.deepEqual(await oauth.processUserInfoResponse(as, client, 'alice', user), {
        sub: 'alice',
        name: alice.displayName,
      });

      const second = await oauth.processRefreshTokenResponse(
        as,
        client,
        await oauth.refreshTokenGrantRequest(as, client, secret, first.refresh_token, insecure),
      );
      assert.notEqual(second.access_token, first.access_token);

      const introspected = async (token) =>
        oauth.processIntrospectionResponse(
          as,
          client,
          await oauth.introspectionRequest(as, client, secret, token, insecure),
        );
      assert.deepEqual(await introspected(first.access_token), { active: false });
      const { exp, ...rest } = await introspected(second.access_token);
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

      await oauth.processRevocationResponse(
        await oauth.revocationRequest(as, client, secret, second.refresh_token, insecure),
      );
      assert.deepEqual(await introspected(second.access_token), { active: false });
      assert.deepEqual(server.rows(), { codes: [], tokens: [] });
    });
  }

test('oauth4webapi takes an answer only from the issuer it asked', async () => {
  const as = await discovered();
  const client = { client_id: album.id };
  const location = await decided(
    `/authorize?response_type=code&client_id=${album.id}&redirect_uri=${encodeURIComponent(album.redirectUri)}`,
  );
  oauth.validateAuthResponse(as, client, location, oauth.expectNoState);
  for (const iss of [undefined, 'https://evil.example']) {
    const forged = new URL(location);
    forged.searchParams.delete('iss');
    if (iss) forged.searchParams.set('iss', iss);
    assert.throws(() => oauth.validateAuthResponse(as, client, forged, oauth.expectNoState), /iss/);
  }
});

test('oauth4webapi tells a denial and a refused code by their error codes', async () => {
  const as = await discovered();
  const client = { client_id: album.id };
  const url = `/authorize?response_type=code&client_id=${album.id}&redirect_uri=${encodeURIComponent(album.redirectUri)}&state=s`;
  const denied = await decided(url, 'Deny');
  assert.throws(() => oauth.validateAuthResponse(as, client, denied, 's'), {
    error: 'access_denied',
  });

  const callback = oauth.validateAuthResponse(as, client, await decided(url), 's');
  const trade = async () =>
    oauth.processAuthorizationCodeResponse(
      as,
      client,
      await oauth.authorizationCodeGrantRequest(
        as,
        client,
        oauth.ClientSecretBasic(album.secret),
        callback,
        album.redirectUri,
        oauth.nopkce,
        insecure,
      ),
    );
  await trade();
  await assert.rejects(trade, { error: 'invalid_grant', status: 400 });
});

test('oauth4webapi reads the challenge of userinfo', async () => {
  const as = await discovered();
  const client = { client_id: album.id };
  const answer = await oauth.userInfoRequest(as, client, 'x'.repeat(64), insecure);
  await assert.rejects(
    oauth.processUserInfoResponse(as, client, oauth.skipSubjectCheck, answer),
    (error) => {
      assert.equal(error.cause[0].scheme, 'bearer');
      assert.equal(error.cause[0].parameters.error, 'invalid_token');
      return true;
    },
  );
});

for (const authorizationMethod of ['header', 'body'])
  for (const challenged of [true, false]) {
    test(`simple-oauth2 goes through everything, secret by ${authorizationMethod}, ${challenged ? 'with' : 'without'} PKCE`, async () => {
      const client = new AuthorizationCode({
        client: { id: album.id, secret: album.secret },
        auth: {
          tokenHost: server.issuer,
          tokenPath: '/token',
          authorizePath: '/authorize',
          revokePath: '/revoke',
        },
        options: { authorizationMethod },
      });
      const { verifier, challenge } = pkce();
      const url = client.authorizeURL({
        redirect_uri: album.redirectUri,
        scope,
        state: 's',
        ...(challenged && withChallenge({ challenge })),
      });
      const callback = await decided(url);
      assert.equal(callback.searchParams.get('state'), 's');
      const first = await client.getToken({
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
