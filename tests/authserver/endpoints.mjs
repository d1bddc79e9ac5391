// The list of the server's endpoints, read from its sources.

import { readFileSync } from 'node:fs';

const list = readFileSync(`${process.env.AUTHSERVER_SOURCE}/endpoints.txt`, 'utf8');

// [{ program, path, methods, client }], where client tells whether clients authenticate there.
export const endpoints = list
  .split('\n')
  .filter((line) => line !== '' && !line.startsWith('#'))
  .map((line) => {
    const [program, path, methods, , client] = line.split(/ +/);
    return { program, path, methods: methods.split(','), client: client === 'yes' };
  });

export const clientPaths = endpoints.filter(({ client }) => client).map(({ path }) => path);
