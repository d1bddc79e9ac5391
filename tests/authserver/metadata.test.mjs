// GET /.well-known/oauth-authorization-server (RFC 8414).

import assert from 'node:assert/strict';
import { after, before, test } from 'node:test';

import { request } from './http.mjs';
import { Server } from './server.mjs';

let server;
before(async () => (server = await Server.start()));
after(() => server.stop());

test('metadata name the issuer, every endpoint and what is served there', async () => {
  const answer = await request(`${server.issuer}/.well-known/oauth-authorization-server`);
  assert.equal(answer.status, 200);
  assert.equal(answer.headers['content-type'], 'application/json');
  const methods = ['client_secret_basic', 'client_secret_post'];
  assert.deepEqual(answer.json, {
    issuer: server.issuer,
    authorization_endpoint: `${server.issuer}/authorize`,
    token_endpoint: `${server.issuer}/token`,
    token_endpoint_auth_methods_supported: methods,
    revocation_endpoint: `${server.issuer}/revoke`,
    revocation_endpoint_auth_methods_supported: methods,
    introspection_endpoint: `${server.issuer}/introspect`,
    introspection_endpoint_auth_methods_supported: methods,
    userinfo_endpoint: `${server.issuer}/userinfo`,
    scopes_supported: ['read', 'write', 'profile'],
    response_types_supported: ['code'],
    response_modes_supported: ['query'],
    grant_types_supported: ['authorization_code', 'refresh_token'],
    code_challenge_methods_supported: ['S256'],
    authorization_response_iss_parameter_supported: true,
  });
});

test('each endpoint refuses other methods than its own with 405', async () => {
  const endpoints = {
    '/.well-known/oauth-authorization-server': 'GET, HEAD',
    '/authorize': 'GET, HEAD, POST',
    '/token': 'POST',
    '/revoke': 'POST',
    '/introspect': 'POST',
    '/userinfo': 'GET, HEAD',
  };
  for (const [path, allowed] of Object.entries(endpoints)) {
    for (const method of ['GET', 'POST', 'PUT', 'DELETE', 'PATCH', 'OPTIONS']) {
      if (allowed.split(', ').includes(method)) continue;
      const answer = await request(server.issuer + path, { method });
      assert.equal(answer.status, 405, `${method} ${path}`);
      assert.equal(answer.headers.allow, allowed, `${method} ${path}`);
    }
  }
});

test('there is nothing behind or beside the endpoints', async () => {
  for (const path of [
    '/',
    '/token/',
    '/token/x',
    '/metadata',
    '/templates/login.tpl',
    '/../lighttpd.conf',
    '/%2e%2e/lighttpd.conf',
    '/users.json',
    '/authserver_setup',
    '/token.cpp',
  ]) {
    const answer = await request(server.issuer + path);
    assert.equal(answer.status, path === '/' ? 403 : 404, path);
    assert.doesNotMatch(answer.text, /authserver/i, path);
  }
});
