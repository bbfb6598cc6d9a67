import { act, renderHook, waitFor } from '@testing-library/react';
import { afterEach, beforeEach, describe, expect, it, vi } from 'vitest';
import { later } from '../../test/fakeApi';
import type { CallOptions } from '../api/client';
import { connection, connectionLost, connectionWorks } from '../api/connection';
import { ApiError } from '../api/error';
import { useCall } from './useCall';
import { usePoll, type PollOptions } from './usePoll';

const refused = new ApiError('answer', { code: 2617 });

beforeEach(() => {
  vi.useFakeTimers();
});

afterEach(() => {
  vi.useRealTimers();
  connectionWorks();
});

const settle = (ms = 0) => act(() => vi.advanceTimersByTimeAsync(ms));

describe('usePoll', () => {
  function poll(load: (options: CallOptions) => Promise<unknown>, options: PollOptions = {}, key = 'a') {
    return renderHook((props: { key: string }) => usePoll(load, props.key, options), {
      initialProps: { key },
    });
  }

  it('asks once, and again only when told to', async () => {
    const load = vi.fn().mockResolvedValue(1);
    const { result } = poll(load);
    expect(result.current).toMatchObject({ loading: true, busy: true });
    await settle();
    expect(result.current).toMatchObject({ data: 1, loading: false, busy: false });
    await settle(60_000);
    expect(load).toHaveBeenCalledTimes(1);
    act(() => result.current.reload());
    await settle();
    expect(load).toHaveBeenCalledTimes(2);
  });

  it('repeats in the background, from each answer on', async () => {
    const load = vi.fn().mockResolvedValue(1);
    poll(load, { every: 1000 });
    await settle(999);
    expect(load).toHaveBeenCalledTimes(1);
    await settle(1);
    expect(load).toHaveBeenCalledTimes(2);
    expect(load.mock.calls.map(([options]) => (options as CallOptions).background)).toEqual([false, true]);
  });

  it('asks anew in the background when what is known changes, but not for what is known first', async () => {
    const load = vi.fn().mockResolvedValue(1);
    const backgrounds = () => load.mock.calls.map(([options]) => (options as CallOptions).background);
    const { result, rerender } = renderHook(
      (props: { key: string; known?: string }) =>
        usePoll(load, props.key, { keep: true, known: props.known }),
      { initialProps: { key: 'a' } as { key: string; known?: string } },
    );
    await settle();
    rerender({ key: 'a', known: 'one' });
    await settle();
    expect(backgrounds()).toEqual([false]);
    rerender({ key: 'a', known: 'two' });
    await settle();
    rerender({ key: 'a', known: 'one' });
    await settle();
    expect(backgrounds()).toEqual([false, true, true]);
    rerender({ key: 'b', known: 'one' });
    await settle();
    act(() => result.current.reload());
    await settle();
    expect(backgrounds()).toEqual([false, true, true, false, false]);
  });

  it('keeps the last answer when a later question fails', async () => {
    const load = vi.fn().mockResolvedValueOnce(1).mockRejectedValueOnce(refused).mockResolvedValue(2);
    const { result } = poll(load, { every: 1000 });
    await settle();
    await settle(1000);
    expect(result.current).toMatchObject({ data: 1, error: refused });
    await settle(1000);
    expect(result.current).toMatchObject({ data: 2, error: undefined });
  });

  it('gives up the question of an earlier key and never shows its answer', async () => {
    const first = later<string>();
    const signals: (AbortSignal | undefined)[] = [];
    const answers = [first.promise, Promise.resolve('second')];
    const { result, rerender } = poll((options) => {
      signals.push(options.signal);
      return answers.shift() as Promise<string>;
    });
    rerender({ key: 'b' });
    await settle();
    expect(signals[0]?.aborted).toBe(true);
    first.resolve('first');
    await settle();
    expect(result.current.data).toBe('second');
  });

  it('rests while the connection is lost and asks anew when it is back', async () => {
    const load = vi.fn().mockResolvedValue(1);
    poll(load, { every: 1000 });
    await settle();
    // Tried again by itself, but there is nobody to ask here.
    act(() => connectionLost());
    await settle(1900);
    expect(load).toHaveBeenCalledTimes(1);
    act(() => connectionWorks());
    await settle();
    expect(load).toHaveBeenCalledTimes(2);
    expect(load).toHaveBeenLastCalledWith(expect.objectContaining({ background: true }));
    expect(connection.get().state).toBe('ok');
  });

  it('leaves it to the banner to tell of a lost connection', async () => {
    const load = vi.fn().mockRejectedValue(new ApiError('network'));
    const { result } = poll(load);
    await settle();
    expect(result.current.error).toBeUndefined();
  });

  it('asks no more when its view is gone', async () => {
    const load = vi.fn().mockResolvedValue(1);
    const { unmount } = poll(load, { every: 1000 });
    await settle();
    unmount();
    await settle(5000);
    expect(load).toHaveBeenCalledTimes(1);
  });
});

describe('useCall', () => {
  it('runs once at a time', async () => {
    vi.useRealTimers();
    const answer = later<number>();
    const load = vi.fn(() => answer.promise);
    const { result } = renderHook(() => useCall(load));
    act(() => {
      void result.current.run();
      void result.current.run();
    });
    expect(load).toHaveBeenCalledTimes(1);
    expect(result.current.busy).toBe(true);
    answer.resolve(7);
    await waitFor(() => expect(result.current).toMatchObject({ busy: false, data: 7, error: undefined }));
  });

  it('holds the error until the next attempt', async () => {
    vi.useRealTimers();
    const load = vi.fn().mockRejectedValueOnce(refused).mockResolvedValueOnce(1);
    const { result } = renderHook(() => useCall(load));
    await act(() => result.current.run());
    expect(result.current.error).toBe(refused);
    await act(() => result.current.run());
    expect(result.current).toMatchObject({ data: 1, error: undefined });
  });
});
