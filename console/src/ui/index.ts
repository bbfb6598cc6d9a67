export { ConnectionBanner } from './ConnectionBanner';
export { ErrorAlert } from './ErrorAlert';
export { Loading } from './Loading';
export { PageHeader } from './PageHeader';
export { useCall, type Act } from './useCall';
export { useNow } from './useNow';
export { usePoll, type Polled, type PollOptions } from './usePoll';
export { TextField } from './TextField';
export { useSettled } from './useSettled';
