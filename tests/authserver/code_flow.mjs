// The steps of the authorization code flow (RFC 6749, section 4.1), one function each.

import { createHash, randomBytes } from 'node:crypto';

import { FormBrowser } from './form_browser.mjs';
import { basic, encoded, post } from './http.mjs';
import { alice } from './server.mjs';

export function pkce() {
  const verifier = randomBytes(32).toString('base64url');
  return { verifier, challenge: createHash('sha256').update(verifier).digest('base64url') };
}

export function withChallenge({ challenge }) {
  return { code_challenge: challenge, code_challenge_method: 'S256' };
}

export function authorizeUrl(client, changes = {}) {
  const parameters = {
    response_type: 'code',
    client_id: client.id,
    redirect_uri: client.redirectUri,
    scope: client.scope,
    state: 'as it was',
    ...changes,
  };
  return `/authorize?${encoded(parameters)}`;
}

export function logIn(browser, user = alice) {
  return browser.submit('Log in', { username: user.name, password: user.password });
}

// A browser in which the user has logged in and sees the consent page.
export async function atConsent(server, client, changes = {}, user = alice) {
  const browser = new FormBrowser(server);
  await browser.open(authorizeUrl(client, changes));
  await logIn(browser, user);
  return browser;
}

// The parameters of the answer after the user has allowed the request.
export async function allowed(server, client, changes = {}, user = alice) {
  const browser = await atConsent(server, client, changes, user);
  const { location } = await browser.submit('Allow');
  return Object.fromEntries(location.searchParams);
}

export function exchangeCode(server, client, code, changes = {}, headers = basic(client)) {
  const parameters = {
    grant_type: 'authorization_code',
    code,
    redirect_uri: client.redirectUri,
    ...changes,
  };
  return post(server, '/token', parameters, headers);
}

export function refresh(server, client, token, changes = {}, headers = basic(client)) {
  return post(
    server,
    '/token',
    { grant_type: 'refresh_token', refresh_token: token, ...changes },
    headers,
  );
}

// The tokens that the client gets.
export async function issued(server, client, changes = {}, user = alice) {
  const { code } = await allowed(server, client, changes, user);
  const answer = await exchangeCode(server, client, code);
  if (answer.status !== 200) throw new Error(`no tokens: ${answer.status} ${answer.text}`);
  return { ...answer.json, code };
}
