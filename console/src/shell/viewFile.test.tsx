import { act, render, screen } from '@testing-library/react';
import { Suspense } from 'react';
import { afterEach, expect, it, vi } from 'vitest';
import { connection, connectionWorks } from '../api/connection';
import { viewFile } from './viewFile';

afterEach(connectionWorks);

it('asks again for a file when the appliance is back', async () => {
  const load = vi
    .fn()
    .mockRejectedValueOnce(new TypeError('not fetched'))
    .mockResolvedValue({ default: () => <p>Here</p> });
  const View = viewFile(load);
  render(
    <Suspense fallback="Loading">
      <View />
    </Suspense>,
  );
  await act(() => vi.waitFor(() => expect(connection.get().state).toBe('lost')));
  expect(load).toHaveBeenCalledTimes(1);
  expect(screen.getByText('Loading')).toBeInTheDocument();
  act(() => connectionWorks());
  expect(await screen.findByText('Here')).toBeInTheDocument();
  expect(load).toHaveBeenCalledTimes(2);
});
