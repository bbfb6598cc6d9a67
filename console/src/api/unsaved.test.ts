import { renderHook } from '@testing-library/react';
import { beforeEach, expect, test } from 'vitest';
import { session, sessionClosed, sessionEnded, sessionStarted } from './session';
import { useRestored, useUnsaved } from './unsaved';

const as = (user: string) => sessionStarted({ csrf: 'token', user, idle_seconds: 900, expires: 4102444800 });

// A form that is shown with something in it, and is gone after `then`.
function shown(entered: unknown, then: () => void) {
  const form = renderHook(() => useUnsaved('form', entered));
  then();
  form.unmount();
}

const restored = (form = 'form') => renderHook(() => useRestored(form)).result.current;

beforeEach(() => {
  sessionClosed();
  session.set({ state: 'unknown' });
  as('admin');
});

test('what was entered when the session ended is there for the same user', () => {
  shown('text', sessionEnded);
  as('admin');
  expect(restored()).toBe('text');
  expect(restored('another')).toBeUndefined();
});

test('what a form showed after the end of the session does not count', () => {
  const form = renderHook((entered: unknown) => useUnsaved('form', entered), { initialProps: 'text' });
  sessionEnded();
  form.rerender('');
  form.unmount();
  as('admin');
  expect(restored()).toBe('text');
});

test('another user does not see it, nor does the first one afterwards', () => {
  shown('text', sessionEnded);
  as('other');
  expect(restored()).toBeUndefined();
  as('admin');
  expect(restored()).toBeUndefined();
});

test.each([
  ['a log-out', sessionClosed],
  ['leaving the form', () => {}],
])('nothing is kept after %s', (_name, then) => {
  shown('text', then);
  as('admin');
  expect(restored()).toBeUndefined();
});

test('a form with nothing entered forgets what it held', () => {
  const form = renderHook((entered: unknown) => useUnsaved('form', entered), {
    initialProps: 'text' as unknown,
  });
  form.rerender(null);
  sessionEnded();
  form.unmount();
  as('admin');
  expect(restored()).toBeUndefined();
});
