import { beforeEach, expect, test } from 'vitest';
import { session, sessionClosed, sessionEnded, sessionStarted } from './session';

const info = { csrf: 'token', user: 'admin', idle_seconds: 900, expires: 4102444800 };

beforeEach(() => session.set({ state: 'unknown' }));

test('a session that has ended stays so, however many calls tell it', () => {
  sessionStarted(info);
  sessionEnded();
  sessionEnded();
  expect(session.get()).toEqual({ state: 'none', ended: true });
});

test('after a log-out a late refusal does not say that a session has ended', () => {
  sessionStarted(info);
  sessionClosed();
  sessionEnded();
  expect(session.get()).toEqual({ state: 'none', ended: false });
});
