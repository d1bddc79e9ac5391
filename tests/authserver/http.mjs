// Plain HTTP: it corrects nothing in a request and follows no redirect.

import http from 'node:http';
import net from 'node:net';

export function request(url, { method = 'GET', headers = {}, body } = {}) {
  return new Promise((resolve, reject) => {
    const length = body === undefined ? {} : { 'content-length': Buffer.byteLength(body) };
    const outgoing = http.request(
      url,
      { method, headers: { ...length, ...headers }, agent: false },
      (answer) => {
        const chunks = [];
        answer.on('data', (chunk) => chunks.push(chunk));
        answer.on('error', reject);
        answer.on('end', () => {
          const text = Buffer.concat(chunks).toString('utf8');
          const json =
            answer.headers['content-type'] === 'application/json' ? JSON.parse(text) : undefined;
          resolve({ status: answer.statusCode, headers: answer.headers, text, json });
        });
      },
    );
    outgoing.on('error', reject);
    outgoing.end(body);
  });
}

// Takes an object, or pairs if a parameter occurs twice. Skips undefined values.
export function encoded(parameters) {
  const pairs = Array.isArray(parameters) ? parameters : Object.entries(parameters);
  return new URLSearchParams(pairs.filter(([, value]) => value !== undefined)).toString();
}

export function basic({ id, secret }) {
  return { authorization: `Basic ${Buffer.from(`${id}:${secret}`).toString('base64')}` };
}

export function bearer(token) {
  return { authorization: `Bearer ${token}` };
}

export function post(server, path, parameters, headers = {}) {
  const body = typeof parameters === 'string' ? parameters : encoded(parameters);
  return request(server.issuer + path, {
    method: 'POST',
    headers: { 'content-type': 'application/x-www-form-urlencoded', ...headers },
    body,
  });
}

// Sends bytes that no HTTP library would send. The status is 0 if the connection ends without one.
export function raw(server, bytes) {
  return new Promise((resolve, reject) => {
    let text = '';
    const socket = net.connect(server.port, '127.0.0.1', () => socket.end(bytes));
    socket.on('data', (chunk) => (text += chunk.toString('latin1')));
    socket.on('error', reject);
    socket.on('close', () =>
      resolve({ status: Number(/^HTTP\/1\.[01] (\d+)/.exec(text)?.[1] ?? 0), text }),
    );
  });
}
