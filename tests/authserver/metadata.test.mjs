// The endpoints, and the metadata document that names them (RFC 8414).

import assert from 'node:assert/strict';
import { readdirSync } from 'node:fs';
import { after, before, test } from 'node:test';

import { clientPaths, endpoints } from './endpoints.mjs';
import { request } from './http.mjs';
import { Server } from './server.mjs';

let server;
before(async () => (server = await Server.start()));
after(() => server.stop());

test('the metadata document names the issuer, every endpoint and what it supports', async () => {
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
  for (const { path, methods } of endpoints) {
    for (const method of ['GET', 'POST', 'PUT', 'DELETE', 'PATCH', 'OPTIONS']) {
      if (methods.includes(method)) continue;
      const answer = await request(server.issuer + path, { method });
      assert.equal(answer.status, 405, `${method} ${path}`);
      assert.equal(answer.headers.allow, methods.join(', '), `${method} ${path}`);
    }
  }
});

// RFC 6749, section 3.2, RFC 7009, section 2.1, and RFC 7662, section 2.1.
test('endpoints where clients authenticate accept POST only', async () => {
  assert.ok(clientPaths.includes('/token'));
  for (const path of clientPaths) {
    const answer = await request(server.issuer + path);
    assert.deepEqual([answer.status, answer.headers.allow], [405, 'POST'], path);
  }
});

test('other endpoints accept GET with HEAD, and only the forms of /authorize come by POST', () => {
  for (const { path, methods, client } of endpoints)
    if (!client)
      assert.equal(methods.join(', '), path === '/authorize' ? 'GET, HEAD, POST' : 'GET, HEAD', path);
});

test('endpoints.txt lists every program of the server', () => {
  const sources = readdirSync(process.env.AUTHSERVER_SOURCE)
    .filter((name) => name.endsWith('.cpp') && name !== 'authserver_setup.cpp')
    .map((name) => name.replace('.cpp', ''));
  assert.deepEqual(endpoints.map(({ program }) => program).sort(), sources.sort());
});

test('paths other than those of the endpoints do not exist', async () => {
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
